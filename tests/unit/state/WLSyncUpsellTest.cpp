#include "state/WLSyncUpsell.h"

#include "log/PCLogManager.h"
#include "state/WLPerUserState.h"
#include "tests/fakes/FakePlatform.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace welcomer {
namespace {

using Lines = std::vector<std::string>;

class WLSyncUpsellTest : public testing::Test {
  protected:
    WLSyncUpsellTest() { fake.recorder.clear(); }

    void logIn(bool syncIsEnabled = false) {
        fake.accountService.accounts["user@nimbus.example"][platform::kSKServiceIDAccountSync].enabled =
            syncIsEnabled;
        fake.accountService.loggedIn = "user@nimbus.example";
    }

    void setScreenLock(bool asksForPassword) {
        fake.preferenceStore.setValue("askForPassword", asksForPassword, "com.corvid.screensaver");
    }

    fakes::FakePlatform fake;
    const platform::ScopedPlatform installed{fake.platform()};
    WLPerUserState& state = WLPerUserState::currentPerUserState();
};

TEST_F(WLSyncUpsellTest, NobodyLoggedInIsOfferedNothingAndNothingIsRecorded) {
    EXPECT_FALSE(WLCurrentUserGetsSyncUpsell());
    EXPECT_FALSE(state.didSeeSyncSetup());
    EXPECT_EQ(fake.recorder.calls(), (Lines{"AccountService.loggedInAccount"}));
}

TEST_F(WLSyncUpsellTest, SyncThatIsEnabledIsRecordedAsSeen) {
    logIn(true);
    EXPECT_FALSE(WLCurrentUserGetsSyncUpsell());
    EXPECT_EQ(fake.systemLog.lines(), (Lines{"Sync upsell skipped because sync is already enabled"}));
    EXPECT_TRUE(state.didSeeSyncSetup());
    EXPECT_TRUE(state.didSeeSyncSetup2());
    EXPECT_EQ(state.lastSeenSyncProductVersion(), fake.systemVersionInfo.version);
}

TEST_F(WLSyncUpsellTest, AScreenLockThatIsOffIsRecordedAsSeen) {
    logIn();
    EXPECT_FALSE(WLCurrentUserGetsSyncUpsell());
    EXPECT_EQ(fake.systemLog.lines(), (Lines{"Sync upsell skipped because screen lock is not enabled"}));
    EXPECT_TRUE(state.didSeeSyncSetup());
    EXPECT_TRUE(state.didSeeSyncSetup2());
}

TEST_F(WLSyncUpsellTest, WhySyncSetupIsSkippedIsLoggedBeforeItIsRecorded) {
    for (const bool syncIsEnabled : {true, false}) {
        state.setDidSeeSyncSetup(false);
        logIn(syncIsEnabled);
        bool wasRecorded = true;
        PCLogManager::sharedManager().setObserver(
            [&](const PCLogManager::Call&) { wasRecorded = state.didSeeSyncSetup(); });
        EXPECT_FALSE(WLCurrentUserGetsSyncUpsell());
        PCLogManager::sharedManager().setObserver({});
        EXPECT_FALSE(wasRecorded);
        EXPECT_TRUE(state.didSeeSyncSetup());
    }
}

TEST_F(WLSyncUpsellTest, AUserWhoSawTheFirstSyncSetupOnlyIsOfferedTheSecond) {
    logIn();
    setScreenLock(true);
    state.setDidSeeSyncSetup(true);
    EXPECT_TRUE(WLCurrentUserGetsSyncUpsell());
    EXPECT_EQ(fake.systemLog.lines(), (Lines{"Keychain Sync Cert Change"}));
}

TEST_F(WLSyncUpsellTest, TheLogNamesItsFunction) {
    Lines functions;
    PCLogManager::sharedManager().setObserver(
        [&](const PCLogManager::Call& call) { functions.emplace_back(call.function); });
    logIn(true);
    WLCurrentUserGetsSyncUpsell();
    logIn(false);
    WLCurrentUserGetsSyncUpsell();
    setScreenLock(true);
    state.setDidSeeSyncSetup2(false);
    WLCurrentUserGetsSyncUpsell();
    PCLogManager::sharedManager().setObserver({});
    EXPECT_EQ(functions, Lines(3, "BOOL WLCurrentUserGetsSyncUpsell()"));
}

// Every state, against the rules written down as a table: the first row that fits decides.
TEST_F(WLSyncUpsellTest, EveryStateIsDecidedAsTheRulesSayAndNoneWritesTheStore) {
    constexpr int kStates = 32;
    for (int bits = 0; bits < kStates; ++bits) {
        SCOPED_TRACE(bits);
        const bool loggedIn = bits & 1;
        const bool enabled = bits & 2;
        const bool locked = bits & 4;
        const bool sawFirst = bits & 8;
        const bool sawSecond = bits & 16;
        fake.accountService.loggedIn.reset();
        if (loggedIn) {
            logIn(enabled);
        }
        setScreenLock(locked);
        state.setDidSeeSyncSetup(sawFirst);
        state.setDidSeeSyncSetup2(sawSecond);
        state.setLastSeenSyncProductVersion("before");
        fake.systemLog.clear();
        fake.recorder.clear();

        struct Row {
            bool fits;
            bool offered;
            bool recorded;
            std::string line;
        };
        const std::vector<Row> table = {
            {!loggedIn, false, false, ""},
            {enabled, false, true, "Sync upsell skipped because sync is already enabled"},
            {!locked, false, true, "Sync upsell skipped because screen lock is not enabled"},
            {!sawFirst, true, false, ""},
            {sawSecond, false, false, ""},
            {true, true, false, "Keychain Sync Cert Change"},
        };
        const Row* row = table.data();
        while (!row->fits) {
            ++row;
        }

        EXPECT_EQ(WLCurrentUserGetsSyncUpsell(), row->offered);
        EXPECT_EQ(fake.systemLog.lines(), row->line.empty() ? Lines() : Lines{row->line});
        EXPECT_EQ(state.didSeeSyncSetup(), row->recorded || sawFirst);
        EXPECT_EQ(state.didSeeSyncSetup2(), row->recorded || sawSecond);
        EXPECT_EQ(state.lastSeenSyncProductVersion(), row->recorded ? "12" : "before");
        EXPECT_EQ(fake.recorder.callsTo("PreferenceStore.setValue"), Lines());
        EXPECT_EQ(fake.recorder.callsTo("PreferenceStore.removeValue"), Lines());
        EXPECT_EQ(fake.recorder.callsTo("PreferenceStore.synchronise"), Lines());
        EXPECT_EQ(fake.preferenceStore.stored("com.corvid.FirstRun"), PropertyList::Dictionary());
    }
}

} // namespace
} // namespace welcomer
