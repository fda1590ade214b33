#include "tools/welcomer/story/PendingBlocks.h"

#include "backends/simulated/VirtualTime.h"

#include <gtest/gtest.h>

namespace welcomer::tool {
namespace {

using namespace std::chrono_literals;

class PendingBlocksTest : public testing::Test {
  protected:
    simulated::VirtualTime time;
    PendingBlocks blocks{time};
};

TEST_F(PendingBlocksTest, WithoutBlocksNothingIsWaitedFor) {
    blocks.wait();
    EXPECT_EQ(time.now(), 0s);
}

TEST_F(PendingBlocksTest, EveryBlockHasRunAfterTheWaitHoweverLongItsDelay) {
    int runs = 0;
    blocks.global().async([&] { ++runs; });
    blocks.global().asyncAfter(3s, [&] { ++runs; });
    blocks.global().asyncAfter(5h, [&] { ++runs; });
    blocks.wait();
    EXPECT_EQ(runs, 3);
    EXPECT_EQ(time.now(), 5h);
}

TEST_F(PendingBlocksTest, ABlockOfABlockIsWaitedForToo) {
    bool hasRun = false;
    blocks.global().asyncAfter(1s, [&] { blocks.global().asyncAfter(1s, [&] { hasRun = true; }); });
    blocks.wait();
    EXPECT_TRUE(hasRun);
}

} // namespace
} // namespace welcomer::tool
