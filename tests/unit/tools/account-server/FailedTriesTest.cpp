#include "tools/account-server/FailedTries.h"

#include <gtest/gtest.h>

namespace welcomer::server {
namespace {

using namespace std::chrono_literals;

class FailedTriesTest : public testing::Test {
  protected:
    void fail(std::size_t count) {
        for (std::size_t i = 0; i < count; ++i) {
            EXPECT_EQ(tries.add("anna", "192.0.2.1"), 0s);
        }
    }

    FailedTries::Clock::time_point now = FailedTries::Clock::now();
    FailedTries tries{3, [this] {
                          return now;
                      }};
};

TEST_F(FailedTriesTest, FiveMayFailAndTheSixthWaitsUntilTheFirstIsAMinuteOld) {
    fail(1);
    now += 10s;
    fail(3);
    EXPECT_EQ(tries.wait("anna", "192.0.2.1"), 0s);
    fail(1);
    EXPECT_EQ(tries.wait("anna", "192.0.2.1"), 50s);
    now += 49500ms;
    EXPECT_EQ(tries.wait("anna", "192.0.2.1"), 1s);
    now += 500ms;
    EXPECT_EQ(tries.wait("anna", "192.0.2.1"), 0s);
}

TEST_F(FailedTriesTest, NeverMoreThanFiveFailWithinAnyMinute) {
    fail(5);
    now += 60s;
    fail(2);
    now += 30s;
    fail(3);
    EXPECT_EQ(tries.wait("anna", "192.0.2.1"), 30s);
    now += 30s;
    fail(2);
    EXPECT_EQ(tries.wait("anna", "192.0.2.1"), 30s);
}

TEST_F(FailedTriesTest, AFailureThatHadToWaitIsNotCountedAndSaysSo) {
    fail(5);
    now += 59s;
    EXPECT_EQ(tries.add("anna", "192.0.2.1"), 1s);
    now += 1s;
    EXPECT_EQ(tries.wait("anna", "192.0.2.1"), 0s);
}

TEST_F(FailedTriesTest, EachAccountAndEachAddressCountsForItself) {
    fail(5);
    EXPECT_EQ(tries.wait("anna", "192.0.2.2"), 0s);
    EXPECT_EQ(tries.wait("bert", "192.0.2.1"), 0s);
    EXPECT_EQ(tries.wait("anna1", "92.0.2.1"), 0s);
}

TEST_F(FailedTriesTest, ThePairThatFailedLongestAgoIsForgottenForANewOne) {
    fail(5);
    now += 1s;
    tries.add("bert", "192.0.2.1");
    now += 1s;
    tries.add("carl", "192.0.2.1");
    EXPECT_EQ(tries.size(), 3U);
    EXPECT_GT(tries.wait("anna", "192.0.2.1"), 0s);
    tries.add("dora", "192.0.2.1");
    EXPECT_EQ(tries.size(), 3U);
    EXPECT_EQ(tries.wait("anna", "192.0.2.1"), 0s);
}

TEST_F(FailedTriesTest, NothingIsRememberedOfWhatFailedMoreThanAMinuteAgo) {
    fail(5);
    now += 30s;
    tries.add("bert", "192.0.2.1");
    now += 30s;
    EXPECT_EQ(tries.size(), 1U);
    now += 30s;
    EXPECT_EQ(tries.size(), 0U);
}

} // namespace
} // namespace welcomer::server
