#include "state/WLPerUserState.h"

#include "log/PCLogManager.h"
#include "tests/fakes/FakePlatform.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <thread>
#include <utility>
#include <vector>

namespace welcomer {
namespace {

using Lines = std::vector<std::string>;
using Dictionary = PropertyList::Dictionary;

const std::string kDomain = "com.corvid.FirstRun";

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

const std::vector<TextProperty> kTexts = {
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
const std::vector<FlagProperty> kFlags = {
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
const Lines kCanonicalOrder = {
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
Dictionary fullRecord(const std::string& prefix) {
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

// Loading

TEST_F(WLPerUserStateTest, AnEmptyStoreLeavesEveryPropertyNoneOrFalse) {
    expectEmpty(WLPerUserState());
}

TEST_F(WLPerUserStateTest, LoadsEveryProperty) {
    store(fullRecord("stored "));
    const WLPerUserState state;
    for (const TextProperty& text : kTexts) {
        EXPECT_EQ((state.*text.get)(), "stored " + text.key);
    }
    for (const FlagProperty& flag : kFlags) {
        EXPECT_TRUE((state.*flag.get)()) << flag.key;
    }
}

TEST_F(WLPerUserStateTest, SynchronisesFirstAndThenReadsAllFourteenKeysInCanonicalOrder) {
    const WLPerUserState state;
    Lines expected = {"PreferenceStore.synchronise " + kDomain};
    for (const std::string& key : kCanonicalOrder) {
        expected.push_back("PreferenceStore.copyValue " + kDomain + ", " + key);
    }
    EXPECT_EQ(fake.recorder.callsTo("PreferenceStore."), expected);
}

TEST_F(WLPerUserStateTest, TheSuperusersRecordIsEmptyWhateverTheStoreHolds) {
    store(fullRecord("stored "));
    fake.processIdentity.setEffectiveUserID(0);
    expectEmpty(WLPerUserState());
    expectEmpty(WLPerUserState::currentPerUserState());
    EXPECT_EQ(fake.recorder.callsTo("PreferenceStore."), Lines());
}

TEST_F(WLPerUserStateTest, ATextOfAnotherTypeReadsAsNone) {
    for (const PropertyList& value :
         {PropertyList(10), PropertyList(10.9), PropertyList(true), PropertyList(PropertyList::Data{"10.9"}),
          PropertyList(PropertyList::Array{"10.9"}), PropertyList(Dictionary())}) {
        for (const TextProperty& text : kTexts) {
            fake.preferenceStore.store(kDomain, text.key, value);
        }
        expectEmpty(WLPerUserState());
    }
}

TEST_F(WLPerUserStateTest, ATextOfAnotherTypeIsInNoDictionaryAndWritingRemovesIt) {
    for (const TextProperty& text : kTexts) {
        fake.preferenceStore.store(kDomain, text.key, 10);
    }
    WLPerUserState state;
    EXPECT_EQ(state.dictionaryRepresentation(), Dictionary());
    EXPECT_TRUE(state.writeToDefaults());
    const Dictionary stored = fake.preferenceStore.stored(kDomain);
    for (const TextProperty& text : kTexts) {
        EXPECT_FALSE(stored.contains(text.key)) << text.key;
    }
}

TEST_F(WLPerUserStateTest, APreviousSystemVersionStoredAsANumberMakesANewUserAccount) {
    store({{"PreviousSystemVersion", 10}});
    const WLPerUserState state;
    EXPECT_EQ(state.previousSystemVersion(), std::nullopt);
    EXPECT_TRUE(state.isNewUserAccount());
}

TEST_F(WLPerUserStateTest, AFlagOfAnotherTypeReadsAsFalseANumberOneToo) {
    for (const PropertyList& value : {PropertyList(1), PropertyList(1.0), PropertyList("YES"),
                                      PropertyList("true"), PropertyList(PropertyList::Array{true})}) {
        for (const FlagProperty& flag : kFlags) {
            fake.preferenceStore.store(kDomain, flag.key, value);
        }
        expectEmpty(WLPerUserState());
    }
}

TEST_F(WLPerUserStateTest, AFlagThatIsStoredAsFalseReadsAsFalse) {
    for (const FlagProperty& flag : kFlags) {
        fake.preferenceStore.store(kDomain, flag.key, false);
    }
    expectEmpty(WLPerUserState());
}

TEST_F(WLPerUserStateTest, WhatOthersStoreIsSeenByANewRecordOrByLoadingAgain) {
    WLPerUserState state;
    store({{"PreviousSystemVersion", "11"}});
    EXPECT_EQ(state.previousSystemVersion(), std::nullopt);
    EXPECT_EQ(WLPerUserState().previousSystemVersion(), "11");
    state._loadFromDefaults();
    EXPECT_EQ(state.previousSystemVersion(), "11");
}

TEST_F(WLPerUserStateTest, LoadingAgainReplacesWhatWasSet) {
    WLPerUserState state;
    state.setPreviousBuildVersion("22A1");
    state.setRunNonInteractive(true);
    state._loadFromDefaults();
    expectEmpty(state);
}

TEST_F(WLPerUserStateTest, TheSharedRecordIsCreatedOnceAlsoWhenManyThreadsAskAtOnce) {
    std::vector<WLPerUserState*> seen(8);
    std::vector<std::thread> threads;
    threads.reserve(seen.size());
    for (WLPerUserState*& each : seen) {
        threads.emplace_back([&each] { each = &WLPerUserState::currentPerUserState(); });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    EXPECT_EQ(seen, std::vector<WLPerUserState*>(seen.size(), seen.front()));
    EXPECT_EQ(fake.recorder.callsTo("PreferenceStore.synchronise").size(), 1U);
}

TEST_F(WLPerUserStateTest, TheSharedRecordIsNotLoadedAgain) {
    WLPerUserState::currentPerUserState();
    store({{"PreviousSystemVersion", "11"}});
    EXPECT_EQ(WLPerUserState::currentPerUserState().previousSystemVersion(), std::nullopt);
}

// Properties

TEST_F(WLPerUserStateTest, EveryPropertyIsItsOwn) {
    WLPerUserState state;
    for (const TextProperty& text : kTexts) {
        (state.*text.set)(text.key);
        EXPECT_EQ(state.dictionaryRepresentation(), (Dictionary{{text.key, text.key}}));
        (state.*text.set)(std::nullopt);
    }
    for (const FlagProperty& flag : kFlags) {
        (state.*flag.set)(true);
        EXPECT_EQ(state.dictionaryRepresentation(), (Dictionary{{flag.key, true}}));
        (state.*flag.set)(false);
    }
    expectEmpty(state);
}

TEST_F(WLPerUserStateTest, TheKeysSayWhichPropertiesAreFlags) {
    Lines all;
    Lines flags;
    for (const WLPerUserState::Key& key : WLPerUserState::keys()) {
        all.push_back(key.name);
        if (key.isFlag) {
            flags.push_back(key.name);
        }
    }
    EXPECT_EQ(all, kCanonicalOrder);
    EXPECT_EQ(flags.size(), kFlags.size());
    for (const FlagProperty& flag : kFlags) {
        EXPECT_EQ(std::count(flags.begin(), flags.end(), flag.key), 1) << flag.key;
    }
}

TEST_F(WLPerUserStateTest, EveryPropertyCanBeSetUnderItsKey) {
    WLPerUserState state;
    for (const TextProperty& text : kTexts) {
        state.setValueForKey(text.key, text.key);
        EXPECT_EQ(state.dictionaryRepresentation(), (Dictionary{{text.key, text.key}}));
        state.setValueForKey(text.key, std::nullopt);
    }
    for (const FlagProperty& flag : kFlags) {
        state.setValueForKey(flag.key, true);
        EXPECT_EQ(state.dictionaryRepresentation(), (Dictionary{{flag.key, true}}));
        state.setValueForKey(flag.key, std::nullopt);
    }
    state.setValueForKey("Other", "x");
    expectEmpty(state);
    EXPECT_EQ(state.dictionaryRepresentation(), Dictionary());
}

TEST_F(WLPerUserStateTest, SettingBothPreviousVersionsSetsTheSystemsFirst) {
    WLPerUserState state;
    state.setPreviousBuildVersion("old");
    std::optional<std::string> buildAtThatMoment;
    const auto observation =
        state.observe("previousSystemVersion", {}, [&] { buildAtThatMoment = state.previousBuildVersion(); });
    state.setPreviousSystemVersionBuildVersion("10.9", "13A603");
    EXPECT_EQ(buildAtThatMoment, "old");
    EXPECT_EQ(state.previousSystemVersion(), "10.9");
    EXPECT_EQ(state.previousBuildVersion(), "13A603");
}

TEST_F(WLPerUserStateTest, ReadsAndWritesOfOnePropertyAreIndivisible) {
    WLPerUserState state;
    const std::string zeros(64, '0');
    const std::string ones(4096, '1');
    state.setLastSeenCloudProductVersion(zeros);
    std::thread writer([&] {
        for (int round = 0; round < 5'000; ++round) {
            state.setLastSeenCloudProductVersion(round % 2 == 0 ? ones : zeros);
        }
    });
    for (int round = 0; round < 5'000; ++round) {
        const auto seen = state.lastSeenCloudProductVersion();
        ASSERT_TRUE(seen == zeros || seen == ones);
    }
    writer.join();
}

// New users

TEST_F(WLPerUserStateTest, ANewUserAccountHasNoPreviousVersionOrOneBelowOne) {
    const std::vector<std::pair<std::optional<std::string>, bool>> cases = {
        {std::nullopt, true}, {"", true},      {"0", true},   {"0.0", true},  {"0.9.1", true}, {"0.", true},
        {"10.0", false},      {"00.1", false}, {"1", false},  {"00", false},  {" 0", false},   {"0 ", false},
        {"0-1", false},       {".0", false},   {"-0", false}, {"0,5", false},
    };
    WLPerUserState state;
    for (const auto& [version, isNew] : cases) {
        state.setPreviousSystemVersion(version);
        EXPECT_EQ(state.isNewUserAccount(), isNew) << version.value_or("none");
    }
}

TEST_F(WLPerUserStateTest, ObserversOfIsNewUserAccountAreToldWheneverThePreviousSystemVersionIsSet) {
    WLPerUserState state;
    Lines told;
    const auto answer = [&] {
        return std::string(state.isNewUserAccount() ? "new" : "old");
    };
    const auto observation = state.observe(
        "isNewUserAccount", [&] { told.push_back("before: " + answer()); },
        [&] { told.push_back("after: " + answer()); });
    state.setPreviousSystemVersion("10.9");
    EXPECT_EQ(told, (Lines{"before: new", "after: old"}));
    state.setPreviousSystemVersion("10.9");
    EXPECT_EQ(told.size(), 4U);
    state.setPreviousSystemVersionBuildVersion("11", "1A");
    EXPECT_EQ(told.size(), 6U);
    state._loadFromDefaults();
    EXPECT_EQ(told.size(), 8U);
}

TEST_F(WLPerUserStateTest, ObserversOfIsNewUserAccountAreNotToldOfOtherProperties) {
    WLPerUserState state;
    int told = 0;
    const auto observation = state.observe(
        "isNewUserAccount", [&] { ++told; }, [&] { ++told; });
    for (const TextProperty& text : kTexts) {
        if (text.key != "PreviousSystemVersion") {
            (state.*text.set)("10.9");
        }
    }
    for (const FlagProperty& flag : kFlags) {
        (state.*flag.set)(true);
    }
    EXPECT_EQ(told, 0);
}

TEST_F(WLPerUserStateTest, DestructionClearsThePreviousVersionAndTellsObservers) {
    auto state = std::make_unique<WLPerUserState>();
    state->setPreviousSystemVersionBuildVersion("10.9", "13A603");
    Lines told;
    const auto describe = [&] {
        return state->previousSystemVersion().value_or("none");
    };
    WLPerUserState* const borrowed = state.get();
    const auto observation = state->observe(
        "previousSystemVersion",
        [&, borrowed] { told.push_back(borrowed->previousSystemVersion().value_or("none")); },
        [&, borrowed] { told.push_back(borrowed->previousSystemVersion().value_or("none")); });
    EXPECT_EQ(describe(), "10.9");
    state.reset();
    EXPECT_EQ(told, (Lines{"10.9", "none"}));
}

TEST_F(WLPerUserStateTest, DestructionClearsThePreviousBuildVersionLast) {
    auto state = std::make_unique<WLPerUserState>();
    state->setPreviousSystemVersionBuildVersion("10.9", "13A603");
    std::optional<std::string> build;
    WLPerUserState* const borrowed = state.get();
    const auto observation = state->observe(
        "previousSystemVersion", [] {}, [&, borrowed] { build = borrowed->previousBuildVersion(); });
    state.reset();
    EXPECT_EQ(build, "13A603");
}

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
