// What every probe of a host's reachability does.

#include "backends/local/LocalHostReachability.h"

#include <gtest/gtest.h>

#include <sched.h>
#include <string>
#include <sys/wait.h>
#include <unistd.h>

namespace welcomer {
namespace {

class HostReachabilityTest : public testing::Test {
  protected:
    local::LocalHostReachability reachability;
};

TEST_F(HostReachabilityTest, AHostWithARouteIsReachable) {
    for (const char* host : {"127.0.0.1", "localhost"}) {
        EXPECT_EQ(reachability.createTarget(host)->flags(), platform::kHostReachable) << host;
    }
}

TEST_F(HostReachabilityTest, ANameThatCannotBeLookedUpIsNotReachable) {
    // Names that no name lookup asks another host about.
    for (const std::string& host : {std::string(), std::string("not a name"), std::string(300, 'x')}) {
        EXPECT_EQ(reachability.createTarget(host)->flags().value_or(0), 0U) << host;
    }
}

TEST_F(HostReachabilityTest, AHostWithoutARouteIsNotReachable) {
    constexpr int kCannot = 77;
    const pid_t child = ::fork();
    if (child == 0) {
        if (::unshare(CLONE_NEWNET) != 0) {
            ::_exit(kCannot);
        }
        // A namespace without a network: not even the loopback device is up.
        const auto flags = reachability.createTarget("192.0.2.1")->flags();
        ::_exit(flags == 0U ? 0 : 1);
    }
    int status = 0;
    ASSERT_EQ(::waitpid(child, &status, 0), child);
    ASSERT_TRUE(WIFEXITED(status));
    if (WEXITSTATUS(status) == kCannot) {
        ASSERT_NE(::geteuid(), 0U) << "the superuser must be able to make a network namespace";
        GTEST_SKIP() << "needs the right to make a network namespace";
    }
    EXPECT_EQ(WEXITSTATUS(status), 0);
}

TEST_F(HostReachabilityTest, ATargetAnswersForTheNetworkAsItIsNow) {
    const auto target = reachability.createTarget("127.0.0.1");
    EXPECT_EQ(target->flags(), target->flags());
}

} // namespace
} // namespace welcomer
