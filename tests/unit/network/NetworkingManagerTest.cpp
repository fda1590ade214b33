#include "network/NetworkingManager.h"

#include "generated/WelcomerConfiguration.h"
#include "tests/fakes/FakePlatform.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

namespace welcomer {
namespace {

class NetworkingManagerTest : public testing::Test {
  protected:
    fakes::FakePlatform fake;
    const platform::ScopedPlatform installed{fake.platform()};
};

TEST_F(NetworkingManagerTest, ProbesThePublicWebHost) {
    const std::string host(configuration::kPublicWebHost);
    EXPECT_TRUE(NetworkingManager::internetIsReachable());
    EXPECT_EQ(fake.recorder.calls(), (std::vector<std::string>{"HostReachability.createTarget " + host,
                                                               "HostReachability.flags " + host}));
}

TEST_F(NetworkingManagerTest, TheInternetIsReachableExactlyWhenBitTwoIsSetAndBitFourIsClear) {
    for (std::uint32_t flags = 0; flags < 16; ++flags) {
        fake.hostReachability.flags = flags;
        EXPECT_EQ(NetworkingManager::internetIsReachable(), (flags & 6) == 2) << flags;
    }
}

TEST_F(NetworkingManagerTest, AHostReachableOnlyAfterAConnectionIsBroughtUpIsNotReachable) {
    fake.hostReachability.flags = platform::kHostReachable | platform::kHostConnectionRequired;
    EXPECT_FALSE(NetworkingManager::internetIsReachable());
}

TEST_F(NetworkingManagerTest, FlagsThatCannotBeReadAreNotReachable) {
    fake.hostReachability.flags = std::nullopt;
    EXPECT_FALSE(NetworkingManager::internetIsReachable());
}

} // namespace
} // namespace welcomer
