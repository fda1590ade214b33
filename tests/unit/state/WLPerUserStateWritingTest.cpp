// The dictionary form, writing, and comparing versions.

#include "log/PCLogManager.h"
#include "state/WLPerUserState.h"
#include "tests/unit/state/WLPerUserStateFixture.h"

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <utility>

namespace welcomer {
namespace {

// The dictionary form

TEST_F(WLPerUserStateTest, TheDictionaryOfAFreshRecordIsEmpty) {
    EXPECT_EQ(WLPerUserState().dictionaryRepresentation(), Dictionary());
}

TEST_F(WLPerUserStateTest, TheDictionaryHoldsAllFourteenKeys) {
    store(fullRecord("stored "));
    EXPECT_EQ(WLPerUserState().dictionaryRepresentation(), fullRecord("stored "));
}

TEST_F(WLPerUserStateTest, TheDictionaryHoldsNoFalseFlagButAnEmptyText) {
    WLPerUserState state;
    state.setDidSeeSyncSetup(false);
    state.setPreviousBuildVersion("");
    EXPECT_EQ(state.dictionaryRepresentation(), (Dictionary{{"PreviousBuildVersion", ""}}));
}

TEST_F(WLPerUserStateTest, ADictionaryOverridesTwelveKeysAndDeliberatelyNotTheCacheCleanup) {
    const auto state = WLPerUserState::initWithDictionaryRepresentation(fullRecord("given "));
    Dictionary expected = fullRecord("given ");
    expected.erase("LastCacheCleanupProductVersion");
    expected.erase("LastCacheCleanupStillRunning");
    EXPECT_EQ(expected.size(), 12U);
    EXPECT_EQ(state->dictionaryRepresentation(), expected);
}

TEST_F(WLPerUserStateTest, TheCacheCleanupKeepsWhatWasLoadedWhateverTheDictionarySays) {
    store({{"LastCacheCleanupProductVersion", "9"}, {"LastCacheCleanupStillRunning", true}});
    const auto state = WLPerUserState::initWithDictionaryRepresentation(
        {{"LastCacheCleanupProductVersion", "12"}, {"LastCacheCleanupStillRunning", false}});
    EXPECT_EQ(state->lastCacheCleanupProductVersion(), "9");
    EXPECT_TRUE(state->lastCacheCleanupStillRunning());
}

TEST_F(WLPerUserStateTest, ADictionaryStartsFromTheStoredValues) {
    store(fullRecord("stored "));
    Dictionary expected = fullRecord("stored ");
    expected["PreviousBuildVersion"] = "given";
    expected.erase("RunNonInteractive");
    const auto state = WLPerUserState::initWithDictionaryRepresentation(
        {{"PreviousBuildVersion", "given"}, {"RunNonInteractive", false}, {"Unknown", "ignored"}});
    EXPECT_EQ(state->dictionaryRepresentation(), expected);
}

TEST_F(WLPerUserStateTest, TheSuperusersDictionaryStartsFromNothing) {
    store(fullRecord("stored "));
    fake.processIdentity.setEffectiveUserID(0);
    const auto state = WLPerUserState::initWithDictionaryRepresentation({{"DidSeeCloudSetup", true}});
    EXPECT_EQ(state->dictionaryRepresentation(), (Dictionary{{"DidSeeCloudSetup", true}}));
}

TEST_F(WLPerUserStateTest, AFlagOfADictionaryIsItsBooleanReading) {
    const auto state = WLPerUserState::initWithDictionaryRepresentation(
        {{"DidSeeCloudSetup", 1}, {"DidSeeSyncSetup", "YES"}, {"DidSeeSyncSetup2", 0.0}});
    EXPECT_EQ(state->dictionaryRepresentation(),
              (Dictionary{{"DidSeeCloudSetup", true}, {"DidSeeSyncSetup", true}}));
}

TEST_F(WLPerUserStateTest, ATextOfADictionaryIsTakenUncheckedAndKeptAsItCame) {
    const Dictionary given = {{"PreviousSystemVersion", 10}, {"LastSeenCloudProductVersion", true}};
    const auto state = WLPerUserState::initWithDictionaryRepresentation(given);
    EXPECT_EQ(state->previousSystemVersion(), std::nullopt);
    EXPECT_EQ(state->lastSeenCloudProductVersion(), std::nullopt);
    EXPECT_TRUE(state->isNewUserAccount());
    EXPECT_EQ(state->dictionaryRepresentation(), given);
    EXPECT_TRUE(state->writeToDefaults());
    EXPECT_EQ(fake.preferenceStore.stored(kDomain)["PreviousSystemVersion"], PropertyList(10));
}

// Writing

TEST_F(WLPerUserStateTest, WritesAllFourteenKeysInCanonicalOrderThenLogsThenSynchronises) {
    WLPerUserState state;
    state.setPreviousSystemVersion("10.9");
    state.setDidSeeSyncSetup2(true);
    fake.recorder.clear();
    EXPECT_TRUE(state.writeToDefaults());
    const std::string set = "PreferenceStore.setValue " + kDomain + ", ";
    const std::string remove = "PreferenceStore.removeValue " + kDomain + ", ";
    EXPECT_EQ(fake.recorder.calls(), (Lines{
                                         set + "PreviousSystemVersion = 10.9",
                                         remove + "PreviousBuildVersion",
                                         set + "DidSeeCloudSetup = 0",
                                         remove + "LastSeenCloudProductVersion",
                                         set + "DidSeeSyncSetup = 0",
                                         set + "DidSeeSyncSetup2 = 1",
                                         remove + "LastSeenSyncProductVersion",
                                         remove + "LastPreLoginTasksPerformedBuild",
                                         remove + "LastPreLoginTasksPerformedVersion",
                                         set + "SkipFirstLoginOptimization = 0",
                                         remove + "LastCacheCleanupProductVersion",
                                         set + "LastCacheCleanupStillRunning = 0",
                                         set + "RunNonInteractive = 0",
                                         set + "ShowKeychainSyncGreeterAtLogin = 0",
                                         "SystemLog.write 115, Writing per-user state",
                                         "PreferenceStore.synchronise " + kDomain,
                                     }));
}

TEST_F(WLPerUserStateTest, StoresFlagsAsBooleansNeverAsNumbersAndFalseOnesToo) {
    WLPerUserState state;
    state.setRunNonInteractive(true);
    EXPECT_TRUE(state.writeToDefaults());
    Dictionary expected;
    for (const FlagProperty& flag : kFlags) {
        expected[flag.key] = flag.key == "RunNonInteractive";
    }
    EXPECT_EQ(fake.preferenceStore.stored(kDomain), expected);
}

TEST_F(WLPerUserStateTest, AMissingTextRemovesItsKeyFromTheStore) {
    store(fullRecord("stored "));
    WLPerUserState state;
    state.setLastSeenSyncProductVersion(std::nullopt);
    EXPECT_TRUE(state.writeToDefaults());
    Dictionary expected = fullRecord("stored ");
    expected.erase("LastSeenSyncProductVersion");
    EXPECT_EQ(fake.preferenceStore.stored(kDomain), expected);
}

TEST_F(WLPerUserStateTest, WritingLeavesForeignKeysAlone) {
    store({{"SomebodyElses", 7}});
    WLPerUserState state;
    EXPECT_TRUE(state.writeToDefaults());
    EXPECT_EQ(fake.preferenceStore.stored(kDomain)["SomebodyElses"], PropertyList(7));
}

TEST_F(WLPerUserStateTest, ChangesReachTheStoreOnlyByWriting) {
    WLPerUserState state;
    state.setDidSeeCloudSetup(true);
    EXPECT_EQ(fake.preferenceStore.stored(kDomain), Dictionary());
}

TEST_F(WLPerUserStateTest, WritingSaysWhetherItWasStored) {
    WLPerUserState state;
    fake.preferenceStore.setFailing(kDomain, true);
    EXPECT_FALSE(state.writeToDefaults());
    EXPECT_EQ(fake.systemLog.lines(), (Lines{"Writing per-user state"}));
    fake.preferenceStore.setFailing(kDomain, false);
    EXPECT_TRUE(state.writeToDefaults());
}

TEST_F(WLPerUserStateTest, TheLogNamesItsFunction) {
    std::string function;
    std::int32_t type = 0;
    PCLogManager::sharedManager().setObserver([&](const PCLogManager::Call& call) {
        function = call.function;
        type = call.type;
    });
    WLPerUserState().writeToDefaults();
    PCLogManager::sharedManager().setObserver({});
    EXPECT_EQ(function, "-[WLPerUserState writeToDefaults]");
    EXPECT_EQ(type, 1);
}

// Comparing versions

TEST_F(WLPerUserStateTest, AMissingVersionIsBelowEveryOther) {
    EXPECT_EQ(WLPerUserState::_compareSystemVersionWith(std::nullopt, std::nullopt), 0);
    EXPECT_EQ(WLPerUserState::_compareSystemVersionWith(std::nullopt, "10.9"), -1);
    EXPECT_EQ(WLPerUserState::_compareSystemVersionWith("10.9", std::nullopt), 1);
    EXPECT_EQ(WLPerUserState::_compareSystemVersionWith(std::nullopt, ""), -1);
}

TEST_F(WLPerUserStateTest, VersionsAreDeliberatelyOrderedByIdentitySoEqualOnesCompareUnequal) {
    const std::string version = "10.9.1";
    EXPECT_NE(WLPerUserState::_compareSystemVersionWith(version, version), 0);
    EXPECT_NE(WLPerUserState::_compareSystemVersionWith("", ""), 0);
    EXPECT_NE(WLPerUserState::_compareSystemVersionWith("1.", "."), 0);
}

class ComponentsTest : public testing::Test {
  protected:
    using Components = WLPerUserState::VersionComponents;

    static int compare(const Components& a, const Components& b) {
        return WLPerUserState::_compareComponentsWith(a, b);
    }

    // Two components, the first of which has the lower address but not the lower text.
    ComponentsTest() {
        if (std::less<>()(high.get(), low.get())) {
            std::swap(low, high);
        }
        *low = "9";
        *high = "1";
    }

    std::shared_ptr<std::string> low = std::make_shared<std::string>();
    std::shared_ptr<std::string> high = std::make_shared<std::string>();
};

TEST_F(ComponentsTest, AreOrderedByAddressNotByText) {
    EXPECT_EQ(compare({low}, {high}), -1);
    EXPECT_EQ(compare({high}, {low}), 1);
    *low = *high;
    EXPECT_EQ(compare({low}, {high}), -1);
}

TEST_F(ComponentsTest, TheVerySameObjectsAreEqualAndTheNextOnesDecide) {
    EXPECT_EQ(compare({low, high, low}, {low, high, low}), 0);
    EXPECT_EQ(compare({low, low}, {low, high}), -1);
    EXPECT_EQ(compare({low, low, high}, {low, low, low}), 1);
}

TEST_F(ComponentsTest, AMissingComponentIsBelowEveryOther) {
    EXPECT_EQ(compare({low}, {low, low}), -1);
    EXPECT_EQ(compare({low, high}, {low}), 1);
    EXPECT_EQ(compare({}, {low}), -1);
    EXPECT_EQ(compare({low}, {low}), 0);
    EXPECT_EQ(compare({}, {}), 0);
}

TEST_F(ComponentsTest, TheFourthAndLaterAreIgnored) {
    EXPECT_EQ(compare({low, low, low, low}, {low, low, low, high}), 0);
    EXPECT_EQ(compare({low, low, low}, {low, low, low, high}), 0);
}

} // namespace
} // namespace welcomer
