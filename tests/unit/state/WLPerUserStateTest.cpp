// Loading, the properties, and new users.

#include "state/WLPerUserState.h"
#include "tests/unit/state/WLPerUserStateFixture.h"

#include <algorithm>
#include <memory>
#include <optional>
#include <string>
#include <thread>
#include <utility>
#include <vector>

namespace welcomer {
namespace {

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

} // namespace
} // namespace welcomer
