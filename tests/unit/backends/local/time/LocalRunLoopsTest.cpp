// What the local run loops promise beyond the interface.

#include "backends/local/time/LocalRunLoops.h"

#include <gtest/gtest.h>

#include <chrono>
#include <memory>
#include <thread>

#include <sys/resource.h>

namespace welcomer::local {
namespace {

using namespace std::chrono_literals;

long sleepsOfThisThread() {
    rusage usage{};
    getrusage(RUSAGE_THREAD, &usage);
    return usage.ru_nvcsw;
}

TEST(LocalRunLoopsTest, ALingeringLoopSleepsOnceForTheWholeDuration) {
    LocalRunLoops loops;
    const auto loop = loops.current();
    const auto port = loop->attachPort();
    const long before = sleepsOfThisThread();
    loop->run(1s);
    // One, and room for what the kernel does on its own; slices of 100 ms would be ten.
    EXPECT_LE(sleepsOfThisThread() - before, 3);
}

TEST(LocalRunLoopsTest, ALoopsBlocksAreReleasedWhenItsThreadEnds) {
    LocalRunLoops loops;
    const auto held = std::make_shared<int>(0);
    std::shared_ptr<platform::RunLoop> orphan;
    std::thread([&] {
        orphan = loops.current();
        orphan->perform([held, loop = orphan] {});
    }).join();
    EXPECT_EQ(held.use_count(), 1);
    orphan->perform([held, loop = orphan] {});
    EXPECT_EQ(held.use_count(), 1);
}

} // namespace
} // namespace welcomer::local
