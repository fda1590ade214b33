// What the tests of the sync destination share.

#pragma once

#include "state/WLKeychainSyncDestination.h"
#include "tests/fakes/FakePlatform.h"
#include "tests/unit/state/SetupHost.h"

#include <cstdint>
#include <gtest/gtest.h>
#include <string>
#include <vector>

namespace welcomer {

using Lines = std::vector<std::string>;

inline const std::string kMarker = "/var/db/.WLFakeComplexRecovery";

class WLKeychainSyncDestinationTest : public testing::Test {
  protected:
    WLKeychainSyncDestinationTest() {
        fake.recorder.clear(); // of what the host's network manager read and logged
        fake.systemLog.clear();
    }

    void setScreenLock(bool asksForPassword) {
        fake.preferenceStore.setValue("askForPassword", asksForPassword, "com.corvid.screensaver");
    }

    void setReachable(bool reachable) {
        fake.hostReachability.flags = reachable ? std::uint32_t{platform::kHostReachable} : 0U;
    }

    bool determine() {
        return WLDetermineKeychainSyncDestination(
            host, [this](WLKeychainSyncDestination destination) { destinations.push_back(destination); });
    }

    fakes::FakePlatform fake;
    const platform::ScopedPlatform installed{fake.platform()};
    SetupHost host{fake.recorder};
    std::vector<std::int64_t> destinations;
};

} // namespace welcomer
