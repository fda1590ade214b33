#include "agent/wlnimbussetup.h"

#include "log/PCLogManager.h"
#include "propertylist/PropertyListWriter.h"
#include "tests/fakes/FakePlatform.h"
#include "tests/fakes/PluginRegistry.h"
#include "tests/unit/agent/TestDelegate.h"

#include <algorithm>
#include <gtest/gtest.h>
#include <new>
#include <stdexcept>
#include <string>
#include <vector>

namespace welcomer {

namespace {

using namespace std::chrono_literals;
using Lines = std::vector<std::string>;
using Wait = fakes::RecordedTime::Wait;
using Waits = std::vector<Wait>;
using Operation = fakes::FakeCredentialStore::Operation;

const std::string kFolder = "/home/user/Library/LaunchAgents";
const std::string kFile = kFolder + "/com.corvid.welcomer.nimbussetup.user.plist";
const std::string kKey = "Welcomer Nimbus Replay Data, Welcomer";

constexpr Wait kGroupWait{Wait::Kind::Group, 100ms};
constexpr Wait kSlice{Wait::Kind::Run, 1s};
constexpr Wait kLinger{Wait::Kind::Run, 120s};

// The first time that the plug-ins are asked for.
const std::string kPluginScan = "FileSystem.list /System/Library/CoreServices/FirstRunPlugins";

class WlnimbussetupTest : public testing::Test {
  protected:
    WlnimbussetupTest() {
        fake.fileSystem.addFile(kFile, "launch agent");
        fake.processLauncher.programs["/usr/bin/killall"] = [](const auto&) {
            return 1; // no such process
        };
        fake.accountService.canCreateAccounts = false; // the first stage in three lines
    }

    void putItem(const std::string& data) {
        fake.credentialStore.put({"Welcomer Nimbus Replay Data", "Welcomer", "anna", std::nullopt}, data);
    }

    // A replay item with one alias and a response for each identifier.
    void putResponses(const std::vector<std::string>& identifiers) {
        PropertyList::Dictionary responses;
        for (const std::string& identifier : identifiers) {
            responses[identifier] = "response";
        }
        putItem(*writeXMLPropertyList(PropertyList::Dictionary{
            {"delegatesResponseDict", PropertyList::Dictionary{{"delegates", responses}}},
            {"vlAliases", PropertyList::Array{"a"}}}));
    }

    TestDelegate& add(const std::string& identifier) {
        auto plugin = std::make_shared<TestDelegate>(identifier);
        plugins.push_back(plugin);
        fakes::fillPluginRegistry(plugins);
        return *plugin;
    }

    int run(std::vector<const char*> arguments = {"wlnimbussetup"}) {
        const int count = static_cast<int>(arguments.size());
        arguments.push_back(nullptr);
        return wlnimbussetup(count, arguments.data());
    }

    bool exists(const std::string& name) const {
        return fake.fileSystem.content(kFolder + '/' + name).has_value();
    }

    DelegatePluginArray plugins;
    fakes::FakePlatform fake;
    const platform::ScopedPlatform installed{fake.platform()};
};

TEST_F(WlnimbussetupTest, WithoutAReplayItemItRemovesItsLaunchAgentFileAndEndsAtOnce) {
    EXPECT_EQ(run(), 0);
    EXPECT_EQ(fake.systemLog.lines(),
              (Lines{"Self destructing...", "Failed to find replay keychain item: 2", "exiting"}));
    EXPECT_FALSE(exists("com.corvid.welcomer.nimbussetup.user.plist"));
    EXPECT_EQ(fake.virtualTime.waits(), Waits{});
    EXPECT_EQ(fake.virtualTime.now(), 0ns);
    EXPECT_EQ(fake.recorder.callsTo("CredentialStore."), Lines{"CredentialStore.findItem " + kKey});
    EXPECT_EQ(fake.recorder.callsTo(kPluginScan), Lines{});
}

TEST_F(WlnimbussetupTest, EveryStepInItsOrder) {
    putResponses({});
    EXPECT_EQ(run(), 0);
    EXPECT_EQ(
        fake.recorder.calls(),
        (Lines{"SystemLog.write 115, Self destructing...", "ProcessIdentity.userLibraryDirectories",
               "FileSystem.remove " + kFile, "CredentialStore.findItem " + kKey,
               "CredentialStore.deleteItem " + kKey, "SystemLog.write 115, Killing onlineaccounts",
               "ProcessLauncher.launchAndWait /usr/bin/killall, -9, com.corvid.onlineaccounts",
               "SystemLog.write 115, Enabling post-login services for account anna",
               "AccountManager.accountForID anna, yes", "SystemLog.write 115, Failed to retrieve SK_Account",
               "SystemLog.write 115, Vidlink: 1 aliases", "SystemLog.write 115, Chatter: 0 aliases",
               kPluginScan, "SystemLog.write 115, delaying exit by two minutes",
               "SystemLog.write 115, exiting"}));
}

TEST_F(WlnimbussetupTest, TheFirstStageGetsTheItemsAccountNameAndRunsBeforeThePluginsAreLoaded) {
    fake.accountService.canCreateAccounts = true;
    fake.accountService.servicesOfNewAccounts = {{platform::kSKServiceIDBookMarks, {}},
                                                 {platform::kSKServiceIDReminders, {}}};
    putResponses({});
    EXPECT_EQ(run(), 0);
    EXPECT_TRUE(fake.accountService.accounts["anna"][platform::kSKServiceIDBookMarks].enabled);
    // Put off by three seconds, and enabled while the agent lingers.
    EXPECT_TRUE(fake.accountService.accounts["anna"][platform::kSKServiceIDReminders].enabled);
    const Lines calls = fake.recorder.calls();
    const auto at = [&](const std::string& call) {
        return std::find(calls.begin(), calls.end(), call) - calls.begin();
    };
    EXPECT_LT(at("CredentialStore.deleteItem " + kKey), at("SystemLog.write 115, Killing onlineaccounts"));
    EXPECT_LT(at("AccountManager.accountForID anna, yes"), at(kPluginScan));
    EXPECT_LT(at(kPluginScan), std::ssize(calls));
}

TEST_F(WlnimbussetupTest, WhatGetsOutOfTheFirstStageIsLoggedAndTheSecondStageFollows) {
    fake.processLauncher.programs["/usr/bin/killall"] = [](const auto&) -> int {
        throw 42;
    };
    TestDelegate& plugin = add("a");
    putResponses({"a"});
    EXPECT_EQ(run(), 0);
    EXPECT_EQ(fake.recorder.callsTo("AccountManager."), Lines{});
    EXPECT_EQ(plugin.calls.size(), 1U);
    EXPECT_EQ(fake.systemLog.lines().back(), "exiting");
}

TEST_F(WlnimbussetupTest, WhatCannotBeLoggedKeepsNoStepFromItsWork) {
    TestDelegate& plugin = add("a");
    putResponses({"a"});
    PCLogManager::sharedManager().setObserver([](const PCLogManager::Call& call) {
        if (call.message.starts_with("Killing") || call.message.starts_with("exception")) {
            throw std::bad_alloc();
        }
    });
    EXPECT_EQ(run(), 0);
    PCLogManager::sharedManager().setObserver({});
    EXPECT_EQ(plugin.calls.size(), 1U);
    EXPECT_EQ(fake.systemLog.lines().back(), "exiting");
}

TEST_F(WlnimbussetupTest, WithoutAnyResponseItStillLingersForTwoMinutes) {
    add("com.corvid.storefront");
    putResponses({});
    EXPECT_EQ(run(), 0);
    EXPECT_EQ(
        fake.systemLog.lines(),
        (Lines{"Self destructing...", "Killing onlineaccounts",
               "Enabling post-login services for account anna", "Failed to retrieve SK_Account",
               "Vidlink: 1 aliases", "Chatter: 0 aliases", "no cached response for com.corvid.storefront",
               "delaying exit by two minutes", "exiting"}));
    EXPECT_EQ(fake.virtualTime.waits(), (Waits{kGroupWait, kLinger}));
    EXPECT_EQ(fake.virtualTime.now(), 120s);
}

TEST_F(WlnimbussetupTest, TheWholeLogOfAFullRun) {
    add("com.corvid.vidlink");
    add("com.corvid.storefront").complete = [this](const CompletionHandler& handler) {
        fake.virtualTime.global().asyncAfter(250ms, [handler] { handler(true, std::nullopt); });
    };
    putResponses({"com.corvid.vidlink", "com.corvid.storefront"});
    EXPECT_EQ(run(), 0);
    EXPECT_EQ(
        fake.systemLog.lines(),
        (Lines{"Self destructing...", "Killing onlineaccounts",
               "Enabling post-login services for account anna", "Failed to retrieve SK_Account",
               "Vidlink: 1 aliases", "Chatter: 0 aliases", "setting up com.corvid.storefront",
               "setting up com.corvid.vidlink", "com.corvid.vidlink setup+chosen: completed (0.000 seconds)",
               "com.corvid.storefront setup: completed (0.250 seconds)", "delaying exit by two minutes",
               "exiting"}));
    EXPECT_EQ(fake.virtualTime.waits(), (Waits{kGroupWait, kSlice, kGroupWait, kSlice, kGroupWait, kLinger}));
    EXPECT_EQ(fake.virtualTime.now(), 120s + 250ms);
    EXPECT_EQ(fake.credentialStore.items().size(), 0U);
}

TEST_F(WlnimbussetupTest, ASecondRunDoesNothing) {
    TestDelegate& plugin = add("a");
    putResponses({"a"});
    EXPECT_EQ(run(), 0);
    fake.systemLog.clear();
    EXPECT_EQ(run(), 0);
    const Lines lines = fake.systemLog.lines();
    ASSERT_EQ(lines.size(), 4U);
    EXPECT_EQ(lines[0], "Self destructing...");
    EXPECT_EQ(lines[1].substr(0, 46), "Failed to remove wlnimbussetup plist for user:");
    EXPECT_EQ(lines[2], "Failed to find replay keychain item: 2");
    EXPECT_EQ(lines[3], "exiting");
    EXPECT_EQ(plugin.calls.size(), 1U);
}

TEST_F(WlnimbussetupTest, TheFirstArgumentIsTheLabelAndFurtherOnesAreIgnored) {
    fake.fileSystem.addFile(kFolder + "/mine.plist", "");
    fake.fileSystem.addFile(kFolder + "/second.plist", "");
    fake.fileSystem.addFile(kFolder + "/third.plist", "");
    EXPECT_EQ(run({"wlnimbussetup", "mine", "second", "third"}), 0);
    EXPECT_EQ(fake.recorder.callsTo("FileSystem."), Lines{"FileSystem.remove " + kFolder + "/mine.plist"});
    EXPECT_FALSE(exists("mine.plist"));
}

TEST_F(WlnimbussetupTest, OneArgumentIsTheLabelAlsoWhenItIsEmpty) {
    EXPECT_EQ(run({"wlnimbussetup", "mine"}), 0);
    EXPECT_EQ(run({"wlnimbussetup", ""}), 0);
    EXPECT_EQ(fake.recorder.callsTo("FileSystem."), (Lines{"FileSystem.remove " + kFolder + "/mine.plist",
                                                           "FileSystem.remove " + kFolder + "/.plist"}));
    EXPECT_TRUE(exists("com.corvid.welcomer.nimbussetup.user.plist"));
}

TEST_F(WlnimbussetupTest, WithoutEvenAProgramNameTheLabelIsTheDefault) {
    EXPECT_EQ(run({}), 0);
    EXPECT_FALSE(exists("com.corvid.welcomer.nimbussetup.user.plist"));
}

TEST_F(WlnimbussetupTest, UnreadableDataEndsItAtOnceAndTheItemStays) {
    std::string deep = "<plist version=\"1.0\">";
    for (int i = 0; i < 100'000; ++i) {
        deep += "<array>";
    }
    for (const std::string& data :
         {std::string(), std::string("<plist><dict><key>a"), std::string("\xFF\x00\x01", 3), deep}) {
        putItem(data);
        fake.systemLog.clear();
        EXPECT_EQ(run(), 0);
        const Lines lines = fake.systemLog.lines();
        ASSERT_GE(lines.size(), 3U);
        EXPECT_EQ(lines[lines.size() - 2].substr(0, 46), "Failed to deserialize replayable data length: ");
        EXPECT_EQ(lines.back(), "exiting");
        ASSERT_EQ(fake.credentialStore.items().size(), 1U);
        EXPECT_EQ(fake.credentialStore.items()[0].data, data);
    }
    EXPECT_EQ(fake.virtualTime.waits(), Waits{});
    EXPECT_EQ(fake.recorder.callsTo(kPluginScan), Lines{});
}

TEST_F(WlnimbussetupTest, AnUnreadableAccountNameEndsItAtOnceAndTheItemStays) {
    putResponses({"a"});
    fake.credentialStore.setStatus(Operation::ReadAttributes, platform::kCredentialReadFailed);
    EXPECT_EQ(run(), 0);
    EXPECT_EQ(fake.systemLog.lines(),
              (Lines{"Self destructing...", "Failed to get account name attribute", "exiting"}));
    EXPECT_EQ(fake.credentialStore.items().size(), 1U);
    EXPECT_EQ(fake.virtualTime.now(), 0ns);
}

TEST_F(WlnimbussetupTest, AReplayObjectThatIsNoDictionaryLeavesNothingToSetUp) {
    add("a");
    putItem(*writeXMLPropertyList("text"));
    EXPECT_EQ(run(), 0);
    EXPECT_EQ(fake.systemLog.lines(),
              (Lines{"Self destructing...", "Killing onlineaccounts",
                     "Enabling post-login services for account anna", "Failed to retrieve SK_Account",
                     "Vidlink: 0 aliases", "Chatter: 0 aliases", "no cached response for a",
                     "delaying exit by two minutes", "exiting"}));
    EXPECT_EQ(fake.virtualTime.now(), 120s);
}

TEST_F(WlnimbussetupTest, AnItemThatCannotBeDeletedIsUsedAllTheSame) {
    TestDelegate& plugin = add("a");
    putResponses({"a"});
    fake.credentialStore.setStatus(Operation::DeleteItem, platform::kCredentialWriteFailed);
    EXPECT_EQ(run(), 0);
    EXPECT_EQ(fake.systemLog.lines()[1], "Failed to delete replay keychain item: 6");
    EXPECT_EQ(plugin.calls.size(), 1U);
    EXPECT_EQ(fake.systemLog.lines().back(), "exiting");
}

TEST_F(WlnimbussetupTest, ALaunchAgentFileThatCannotBeRemovedStopsNothing) {
    TestDelegate& plugin = add("a");
    putResponses({"a"});
    fake.fileSystem.fail(fakes::FakeFileSystem::Operation::Remove, kFile, 30, "read-only");
    EXPECT_EQ(run(), 0);
    EXPECT_EQ(fake.systemLog.lines()[1], "Failed to remove wlnimbussetup plist for user: read-only");
    EXPECT_EQ(plugin.calls.size(), 1U);
}

TEST_F(WlnimbussetupTest, AHandlerThatIsNeverCalledKeepsTheAgentWaiting) {
    CompletionHandler kept;
    add("a").complete = [&](const CompletionHandler& handler) {
        kept = handler;
    };
    putResponses({"a"});
    Lines linesAfterAnHour;
    fake.virtualTime.global().asyncAfter(1h, [&] {
        linesAfterAnHour = fake.systemLog.lines();
        kept(true, std::nullopt); // so that the test ends
    });
    EXPECT_EQ(run(), 0);
    ASSERT_FALSE(linesAfterAnHour.empty());
    EXPECT_EQ(linesAfterAnHour.back(), "setting up a");
    EXPECT_EQ(fake.virtualTime.now(), 1h + 120s);
    const Waits waits = fake.virtualTime.waits();
    ASSERT_GE(waits.size(), 4U);
    for (std::size_t i = 0; i + 2 < waits.size(); i += 2) {
        ASSERT_EQ(waits[i], kGroupWait);
        ASSERT_EQ(waits[i + 1], kSlice);
    }
    EXPECT_EQ(waits[waits.size() - 2], kGroupWait);
    EXPECT_EQ(waits.back(), kLinger);
}

TEST_F(WlnimbussetupTest, WorkOnTheMainThreadRunsBetweenTheWaits) {
    const auto mainLoop = fake.virtualTime.current();
    add("a").complete = [&](const CompletionHandler& handler) {
        mainLoop->perform([handler] { handler(true, std::nullopt); });
    };
    putResponses({"a"});
    EXPECT_EQ(run(), 0);
    EXPECT_EQ(fake.virtualTime.waits(), (Waits{kGroupWait, kSlice, kGroupWait, kLinger}));
}

TEST_F(WlnimbussetupTest, WorkOutsideTheGroupFinishesDuringTheLinger) {
    const auto mainLoop = fake.virtualTime.current();
    Lines linesThen;
    add("a").complete = [&](const CompletionHandler& handler) {
        fake.virtualTime.global().asyncAfter(
            119s, [&] { mainLoop->perform([&] { linesThen = fake.systemLog.lines(); }); });
        handler(true, std::nullopt);
    };
    putResponses({"a"});
    EXPECT_EQ(run(), 0);
    ASSERT_FALSE(linesThen.empty());
    EXPECT_EQ(linesThen.back(), "delaying exit by two minutes");
}

TEST_F(WlnimbussetupTest, TheLingersPortIsGoneAfterwards) {
    putResponses({});
    EXPECT_EQ(run(), 0);
    fake.virtualTime.current()->run(10s);
    EXPECT_EQ(fake.virtualTime.now(), 120s);
}

TEST_F(WlnimbussetupTest, PluginsThatRaiseEverywhereDoNotChangeTheExitStatus) {
    add("a").complete = [](const CompletionHandler&) {
        throw 42;
    };
    add("b").identify = []() -> std::optional<std::string> {
        throw std::string("no");
    };
    putResponses({"a", "b"});
    EXPECT_EQ(run(), 0);
    EXPECT_EQ(fake.systemLog.lines().back(), "exiting");
    EXPECT_EQ(fake.virtualTime.now(), 120s);
}

TEST_F(WlnimbussetupTest, WhatGetsOutOfAStepIsLoggedAndTheNextStepsFollow) {
    putResponses({});
    fake.fileSystem.addFile("/System/Library/CoreServices/FirstRunPlugins/a.ncdplugin", "");
    fake.pluginBundle.onLoad = [] {
        throw std::runtime_error("no memory");
    };
    EXPECT_EQ(run(), 0);
    EXPECT_EQ(fake.systemLog.lines(),
              (Lines{"Self destructing...", "Killing onlineaccounts",
                     "Enabling post-login services for account anna", "Failed to retrieve SK_Account",
                     "Vidlink: 1 aliases", "Chatter: 0 aliases", "exception in wlnimbussetup: no memory",
                     "delaying exit by two minutes", "exiting"}));
    EXPECT_EQ(fake.virtualTime.now(), 120s);
}

} // namespace
} // namespace welcomer
