#include "tools/welcomer/login/LoginRecord.h"

#include "agent/wlnimbussetup.h"
#include "log/PCLogManager.h"
#include "propertylist/PropertyListWriter.h"
#include "tests/fakes/FakePlatform.h"
#include "tests/fakes/PluginRegistry.h"
#include "tests/unit/agent/TestDelegate.h"

#include <gtest/gtest.h>
#include <stdexcept>
#include <string>
#include <vector>

namespace welcomer::tool {
namespace {

using namespace std::chrono_literals;
using Lines = std::vector<std::string>;
using Kind = DelegateOutcome::Kind;

// Each record is made from the lines that the agent itself logs, so that a text that changes is missed here.
class LoginRecordTest : public testing::Test {
  protected:
    LoginRecordTest() {
        fake.fileSystem.addFile("/home/user/Library/LaunchAgents/com.corvid.welcomer.nimbussetup.user.plist",
                                "");
        fake.processLauncher.programs["/usr/bin/killall"] = [](const auto&) {
            return 1;
        };
    }
    ~LoginRecordTest() override { PCLogManager::sharedManager().setObserver({}); }

    TestDelegate& add(const std::string& identifier) {
        auto plugin = std::make_shared<TestDelegate>(identifier);
        plugins.push_back(plugin);
        fakes::fillPluginRegistry(plugins);
        return *plugin;
    }

    void putItem(const std::vector<std::string>& identifiers) {
        PropertyList::Dictionary responses;
        for (const std::string& identifier : identifiers) {
            responses[identifier] = "response";
        }
        putData(*writeXMLPropertyList(PropertyList::Dictionary{
            {"delegatesResponseDict", PropertyList::Dictionary{{"delegates", responses}}}}));
    }

    void putData(const std::string& data) {
        fake.credentialStore.put({"Welcomer Nimbus Replay Data", "Welcomer", "anna", std::nullopt}, data);
    }

    // Runs the agent to its end.
    //  result  the record of its lines
    LoginRecord run() {
        LoginRecord record;
        PCLogManager::sharedManager().setObserver([&](const PCLogManager::Call& call) {
            if (!record.read(fake.virtualTime.now(), call.message)) {
                unread.push_back(call.message);
            }
        });
        const char* const arguments[] = {"wlnimbussetup", nullptr};
        wlnimbussetup(1, arguments);
        return record;
    }

    Lines unread; // the lines that the records keep nothing of
    DelegatePluginArray plugins;
    fakes::FakePlatform fake;
    const platform::ScopedPlatform installed{fake.platform()};
};

// As "identifier|outcome|seconds|begin|end", the times in milliseconds.
Lines delegates(const LoginRecord& record) {
    Lines rows;
    for (const DelegateOutcome& each : record.delegates()) {
        rows.push_back(each.identifier + "|" + each.text() + "|" + each.seconds + "|" +
                       std::to_string(each.begin / 1ms) + "|" + std::to_string(each.end / 1ms));
    }
    return rows;
}

// As "identifier|outcome|named|settled".
Lines services(const LoginRecord& record) {
    Lines rows;
    for (const ServiceOutcome& each : record.services()) {
        rows.push_back(each.identifier.substr(each.identifier.rfind('.') + 1) + "|" + each.text() + "|" +
                       std::to_string(each.named / 1ms) + "|" + std::to_string(each.settled / 1ms));
    }
    return rows;
}

TEST_F(LoginRecordTest, EveryOutcomeOfADelegateWithItsTimes) {
    add("a.completes").complete = [this](const CompletionHandler& handler) {
        fake.virtualTime.global().asyncAfter(250ms, [handler] { handler(true, std::nullopt); });
    };
    add("a.refuses").complete = [this](const CompletionHandler& handler) {
        fake.virtualTime.global().asyncAfter(1500ms, [handler] {
            handler(false, platform::Error{1, "no room"});
        });
    };
    add("a.raises").complete = [](const CompletionHandler&) {
        throw std::runtime_error("it broke");
    };
    add("a.unasked");
    add("com.corvid.chatter");
    putItem({"a.completes", "a.refuses", "a.raises", "com.corvid.chatter"});
    const LoginRecord record = run();
    Lines rows = delegates(record);
    std::ranges::sort(rows);
    EXPECT_EQ(rows, (Lines{"a.completes|completed|0.250|0|250", "a.raises|exception: it broke|0.000|0|0",
                           "a.refuses|no room|1.500|0|1500", "a.unasked|no cached response||0|0",
                           "com.corvid.chatter|completed|0.000|0|0"}));
    EXPECT_EQ(record.account(), "anna");
    EXPECT_EQ(record.waiting(), 0ns);
    EXPECT_EQ(record.lingering(), 1500ms);
    EXPECT_EQ(record.end(), LoginRecord::End::Ended);
    EXPECT_EQ(record.last(), 121500ms);
    EXPECT_EQ(record.itemStatus(), std::nullopt);
    EXPECT_EQ(unread, (Lines{"Self destructing...", "Killing onlineaccounts", "Vidlink: 0 aliases",
                             "Chatter: 0 aliases"}));
}

TEST_F(LoginRecordTest, EveryOutcomeOfAService) {
    fake.accountService.servicesOfNewAccounts = {
        {platform::kSKServiceIDContacts, {}},
        {platform::kSKServiceIDCalendars, {}},
        {platform::kSKServiceIDBookMarks, {.canBeEnabled = false, .properties = {}}},
        {platform::kSKServiceIDMail,
         {.canBeEnabled = true, .properties = {{platform::kSKPropertyMailEmailAddress, "anna@example.org"}}}},
        {platform::kSKServiceIDNotes, {.canBeEnabled = false, .properties = {}}}};
    putItem({});
    const LoginRecord record = run();
    const std::string refused = " cannot be enabled on this machine for this user.";
    EXPECT_EQ(services(record),
              (Lines{"contacts|enabled|0|0", "calendars|enabled|0|3000",
                     "bookmarks|Nimbus service 'com.corvid.nimbus.service.bookmarks'" + refused + "|0|0",
                     "mediastream|left to setup|0|0",
                     "reminders|Nimbus service 'com.corvid.nimbus.service.reminders'" + refused + "|0|0",
                     "accountsync|left to setup|0|0", "locator|left to setup|0|0", "mail|enabled|0|0",
                     "notes|Nimbus Notes" + refused + "|0|0", "documents|left to setup|0|0"}));
    EXPECT_EQ(record.failures(), Lines{});
    EXPECT_EQ(unread.size(), 4U);
}

TEST_F(LoginRecordTest, MailAndNotesWithoutAnAddress) {
    fake.accountService.servicesOfNewAccounts = {{platform::kSKServiceIDMail, {}},
                                                 {platform::kSKServiceIDNotes, {}}};
    putItem({});
    Lines rows = services(run());
    EXPECT_EQ(rows[7], "mail|Could not enable Nimbus Mail, no address specified by SKService|0|0");
    EXPECT_EQ(rows[8], "notes|Cannot enable Nimbus notes without associated email address|0|0");
    EXPECT_EQ(unread.size(), 4U);
}

TEST_F(LoginRecordTest, ServicesThatAreNotThere) {
    putItem({});
    const Lines rows = services(run());
    EXPECT_EQ(rows[7], "mail|No Nimbus Mail service available to enable|0|0");
    EXPECT_EQ(unread.size(), 4U);
}

TEST_F(LoginRecordTest, NotesThatCanBeEnabled) {
    fake.accountService.servicesOfNewAccounts = {
        {platform::kSKServiceIDMail,
         {.canBeEnabled = false, .properties = {{platform::kSKPropertyMailEmailAddress, "a@example.org"}}}},
        {platform::kSKServiceIDNotes, {}}};
    putItem({});
    const Lines rows = services(run());
    EXPECT_EQ(rows[7], "mail|Nimbus Mail cannot be enabled on this machine for this user.|0|0");
    EXPECT_EQ(rows[8], "notes|enabled|0|0");
}

TEST_F(LoginRecordTest, AnItemThatWasNotFoundOrCouldNotBeAskedFor) {
    EXPECT_EQ(run().itemStatus(), platform::kCredentialItemNotFound);
    fake.credentialStore.setStatus(fakes::FakeCredentialStore::Operation::FindItem,
                                   platform::kCredentialLocked);
    const LoginRecord locked = run();
    EXPECT_EQ(locked.itemStatus(), platform::kCredentialLocked);
    EXPECT_EQ(locked.end(), LoginRecord::End::Ended);
    EXPECT_EQ(locked.account(), "");
}

TEST_F(LoginRecordTest, FailuresAreKeptAsTheyAreLogged) {
    add("a").identify = []() -> std::optional<std::string> {
        throw std::runtime_error("no identifier");
    };
    fake.accountService.canCreateAccounts = false;
    fake.processLauncher.programs["/usr/bin/killall"] = [](const auto&) -> int {
        throw std::runtime_error("no such program");
    };
    fake.credentialStore.setStatus(fakes::FakeCredentialStore::Operation::DeleteItem,
                                   platform::kCredentialWriteFailed);
    fake.fileSystem.fail(fakes::FakeFileSystem::Operation::Remove,
                         "/home/user/Library/LaunchAgents/com.corvid.welcomer.nimbussetup.user.plist", 30,
                         "read-only");
    putItem({});
    EXPECT_EQ(run().failures(),
              (Lines{"Failed to remove wlnimbussetup plist for user: read-only",
                     "Failed to delete replay keychain item: 6",
                     "Exception killing onlineaccounts: no such program", "Failed to retrieve SK_Account",
                     "exception querying plugin <TestDelegate> for id: no identifier"}));
}

TEST_F(LoginRecordTest, AnItemThatCannotBeUsed) {
    putData("no property list");
    const LoginRecord unreadable = run();
    ASSERT_EQ(unreadable.failures().size(), 1U);
    EXPECT_TRUE(unreadable.failures()[0].starts_with("Failed to deserialize replayable data length: "));
}

TEST_F(LoginRecordTest, AnAccountNameThatCannotBeRead) {
    putItem({});
    fake.credentialStore.setStatus(fakes::FakeCredentialStore::Operation::ReadAttributes,
                                   platform::kCredentialReadFailed);
    EXPECT_EQ(run().failures(), Lines{"Failed to get account name attribute"});
}

TEST_F(LoginRecordTest, AStepThatRaises) {
    putItem({});
    fake.fileSystem.addFile("/System/Library/CoreServices/FirstRunPlugins/a.ncdplugin", "");
    fake.pluginBundle.onLoad = [] {
        throw std::runtime_error("no memory");
    };
    EXPECT_EQ(run().failures(), Lines{"exception in wlnimbussetup: no memory"});
}

TEST_F(LoginRecordTest, APluginThatIsNone) {
    putItem({});
    fake.fileSystem.addFile("/System/Library/CoreServices/FirstRunPlugins/a.ncdplugin", "");
    EXPECT_EQ(run().failures(), Lines{"Nimbus Plugins: Failed to get principal class for a.ncdplugin"});
}

TEST_F(LoginRecordTest, WithoutItsLastLineADelegateIsStillAtWork) {
    CompletionHandler kept;
    add("a.silent").complete = [&](const CompletionHandler& handler) {
        kept = handler;
    };
    putItem({"a.silent"});
    LoginRecord soFar;
    fake.virtualTime.global().asyncAfter(1h, [&] { kept(true, std::nullopt); });
    bool isHour = false;
    PCLogManager::sharedManager().setObserver([&](const PCLogManager::Call& call) {
        isHour = isHour || fake.virtualTime.now() >= 1h;
        if (!isHour) {
            soFar.read(fake.virtualTime.now(), call.message);
        }
    });
    const char* const arguments[] = {"wlnimbussetup", nullptr};
    wlnimbussetup(1, arguments);
    EXPECT_EQ(delegates(soFar), Lines{"a.silent|working||0|0"});
    EXPECT_EQ(soFar.working(), 1U);
    EXPECT_EQ(soFar.end(), LoginRecord::End::Unfinished);
    EXPECT_EQ(soFar.lingering(), std::nullopt);
}

TEST(LoginRecord, APlugInsLastWordsAreTheEnd) {
    LoginRecord record;
    EXPECT_TRUE(record.read(0ns, "setting up a"));
    EXPECT_TRUE(record.read(1s, "ended by plug-in a.ncdplugin: SIGSEGV"));
    EXPECT_EQ(record.end(), LoginRecord::End::Broken);
    EXPECT_EQ(record.endReason(), "ended by plug-in a.ncdplugin: SIGSEGV");
    EXPECT_EQ(record.delegates()[0].kind, Kind::Working);
}

} // namespace
} // namespace welcomer::tool
