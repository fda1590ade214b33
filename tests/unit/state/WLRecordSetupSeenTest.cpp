#include "state/WLRecordSetupSeen.h"

#include "state/WLPerUserState.h"
#include "tests/fakes/FakePlatform.h"

#include <gtest/gtest.h>

#include <optional>

namespace welcomer {
namespace {

class WLRecordSetupSeenTest : public testing::Test {
  protected:
    fakes::FakePlatform fake;
    const platform::ScopedPlatform installed{fake.platform()};
    WLPerUserState& state = WLPerUserState::currentPerUserState();
};

TEST_F(WLRecordSetupSeenTest, TheCloudSetupIsSeenAtTheRunningProductVersion) {
    fake.systemVersionInfo.version = "12.1";
    WLRecordCloudSetupSeen();
    EXPECT_EQ(
        state.dictionaryRepresentation(),
        (PropertyList::Dictionary{{"DidSeeCloudSetup", true}, {"LastSeenCloudProductVersion", "12.1"}}));
}

TEST_F(WLRecordSetupSeenTest, BothSyncSetupsAreSeenAtTheRunningProductVersion) {
    fake.systemVersionInfo.version = "12.1";
    WLRecordSyncSetupSeen();
    EXPECT_EQ(state.dictionaryRepresentation(),
              (PropertyList::Dictionary{{"DidSeeSyncSetup", true},
                                        {"DidSeeSyncSetup2", true},
                                        {"LastSeenSyncProductVersion", "12.1"}}));
}

TEST_F(WLRecordSetupSeenTest, ASystemThatDoesNotSayItsVersionLeavesNone) {
    state.setLastSeenCloudProductVersion("11");
    state.setLastSeenSyncProductVersion("11");
    fake.systemVersionInfo.version = std::nullopt;
    WLRecordCloudSetupSeen();
    WLRecordSyncSetupSeen();
    EXPECT_EQ(state.lastSeenCloudProductVersion(), std::nullopt);
    EXPECT_EQ(state.lastSeenSyncProductVersion(), std::nullopt);
}

TEST_F(WLRecordSetupSeenTest, NothingIsStoredUntilTheRecordIsWritten) {
    fake.recorder.clear();
    WLRecordCloudSetupSeen();
    WLRecordSyncSetupSeen();
    EXPECT_TRUE(fake.recorder.callsTo("PreferenceStore.").empty());
}

} // namespace
} // namespace welcomer
