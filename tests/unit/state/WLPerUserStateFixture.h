// What the tests of the record of setup share.

#pragma once

#include "state/WLPerUserState.h"
#include "tests/fakes/FakePlatform.h"

#include <gtest/gtest.h>
#include <optional>
#include <string>
#include <vector>

namespace welcomer {

using Lines = std::vector<std::string>;
using Dictionary = PropertyList::Dictionary;

inline const std::string kDomain = "com.corvid.FirstRun";

// The properties and their keys, as they are given: in canonical order.
struct TextProperty {
    std::string key;
    std::optional<std::string> (WLPerUserState::*get)() const;
    void (WLPerUserState::*set)(const std::optional<std::string>&);
};
struct FlagProperty {
    std::string key;
    bool (WLPerUserState::*get)() const;
    void (WLPerUserState::*set)(bool);
};

inline const std::vector<TextProperty> kTexts = {
    {"PreviousSystemVersion", &WLPerUserState::previousSystemVersion,
     &WLPerUserState::setPreviousSystemVersion},
    {"PreviousBuildVersion", &WLPerUserState::previousBuildVersion, &WLPerUserState::setPreviousBuildVersion},
    {"LastSeenCloudProductVersion", &WLPerUserState::lastSeenCloudProductVersion,
     &WLPerUserState::setLastSeenCloudProductVersion},
    {"LastSeenSyncProductVersion", &WLPerUserState::lastSeenSyncProductVersion,
     &WLPerUserState::setLastSeenSyncProductVersion},
    {"LastPreLoginTasksPerformedBuild", &WLPerUserState::lastPreLoginTasksPerformedBuild,
     &WLPerUserState::setLastPreLoginTasksPerformedBuild},
    {"LastPreLoginTasksPerformedVersion", &WLPerUserState::lastPreLoginTasksPerformedVersion,
     &WLPerUserState::setLastPreLoginTasksPerformedVersion},
    {"LastCacheCleanupProductVersion", &WLPerUserState::lastCacheCleanupProductVersion,
     &WLPerUserState::setLastCacheCleanupProductVersion},
};
inline const std::vector<FlagProperty> kFlags = {
    {"DidSeeCloudSetup", &WLPerUserState::didSeeCloudSetup, &WLPerUserState::setDidSeeCloudSetup},
    {"DidSeeSyncSetup", &WLPerUserState::didSeeSyncSetup, &WLPerUserState::setDidSeeSyncSetup},
    {"DidSeeSyncSetup2", &WLPerUserState::didSeeSyncSetup2, &WLPerUserState::setDidSeeSyncSetup2},
    {"SkipFirstLoginOptimization", &WLPerUserState::skipFirstLoginOptimization,
     &WLPerUserState::setSkipFirstLoginOptimization},
    {"LastCacheCleanupStillRunning", &WLPerUserState::lastCacheCleanupStillRunning,
     &WLPerUserState::setLastCacheCleanupStillRunning},
    {"RunNonInteractive", &WLPerUserState::runNonInteractive, &WLPerUserState::setRunNonInteractive},
    {"ShowKeychainSyncGreeterAtLogin", &WLPerUserState::showKeychainSyncGreeterAtLogin,
     &WLPerUserState::setShowKeychainSyncGreeterAtLogin},
};
inline const Lines kCanonicalOrder = {
    "PreviousSystemVersion",
    "PreviousBuildVersion",
    "DidSeeCloudSetup",
    "LastSeenCloudProductVersion",
    "DidSeeSyncSetup",
    "DidSeeSyncSetup2",
    "LastSeenSyncProductVersion",
    "LastPreLoginTasksPerformedBuild",
    "LastPreLoginTasksPerformedVersion",
    "SkipFirstLoginOptimization",
    "LastCacheCleanupProductVersion",
    "LastCacheCleanupStillRunning",
    "RunNonInteractive",
    "ShowKeychainSyncGreeterAtLogin",
};

// Something under every key; texts are the key in lower case or so.
inline Dictionary fullRecord(const std::string& prefix) {
    Dictionary record;
    for (const TextProperty& text : kTexts) {
        record[text.key] = prefix + text.key;
    }
    for (const FlagProperty& flag : kFlags) {
        record[flag.key] = true;
    }
    return record;
}

class WLPerUserStateTest : public testing::Test {
  protected:
    void store(const Dictionary& record) {
        for (const auto& [key, value] : record) {
            fake.preferenceStore.store(kDomain, key, value);
        }
    }

    static void expectEmpty(const WLPerUserState& state) {
        for (const TextProperty& text : kTexts) {
            EXPECT_EQ((state.*text.get)(), std::nullopt) << text.key;
        }
        for (const FlagProperty& flag : kFlags) {
            EXPECT_FALSE((state.*flag.get)()) << flag.key;
        }
    }

    fakes::FakePlatform fake;
    const platform::ScopedPlatform installed{fake.platform()};
};

} // namespace welcomer
