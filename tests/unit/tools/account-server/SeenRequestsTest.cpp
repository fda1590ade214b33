#include "tools/account-server/SeenRequests.h"

#include <gtest/gtest.h>

namespace welcomer::server {
namespace {

using namespace std::chrono_literals;

class SeenRequestsTest : public testing::Test {
  protected:
    SeenRequests::Clock::time_point now = SeenRequests::Clock::now();
    SeenRequests seen{3, [this] {
                          return now;
                      }};
};

TEST_F(SeenRequestsTest, TheSameBodyIsNewOnceAndAnyOtherOneIsNewToo) {
    EXPECT_TRUE(seen.add("one"));
    EXPECT_FALSE(seen.add("one"));
    EXPECT_TRUE(seen.add("one "));
    EXPECT_FALSE(seen.add("one"));
}

TEST_F(SeenRequestsTest, ARequestIsRememberedForAMinuteAtLeastAndNotForEver) {
    EXPECT_TRUE(seen.add("one"));
    now += 61s;
    EXPECT_FALSE(seen.add("one"));
    now += SeenRequests::kRemembered;
    EXPECT_EQ(seen.size(), 0U);
    EXPECT_TRUE(seen.add("one"));
}

TEST_F(SeenRequestsTest, TheOldestIsForgottenForANewOne) {
    for (const char* const body : {"one", "two", "three", "four"}) {
        EXPECT_TRUE(seen.add(body));
    }
    EXPECT_EQ(seen.size(), 3U);
    EXPECT_FALSE(seen.add("two"));
    EXPECT_TRUE(seen.add("one"));
}

} // namespace
} // namespace welcomer::server
