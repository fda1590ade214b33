// Accounts in a file survive other processes, kills and damage.

#include "backends/local/accounts/LocalAccountService.h"
#include "cloud/WLNimbusServiceCatalogue.h"
#include "propertylist/PropertyListWriter.h"
#include "tests/support/KillAtSystemCall.h"
#include "tests/unit/backends/local/accounts/LocalAccountServiceFixture.h"

#include <csignal>
#include <fcntl.h>
#include <string>
#include <sys/stat.h>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>
#include <vector>

namespace welcomer {
namespace {

TEST_F(LocalAccountServiceTest, AServiceWhoseAccountHasGoneIsNotMadeAgain) {
    const auto contacts = service.accountForID("anna", true)->serviceForID(kSKServiceIDContacts);
    root.addFile(kFile, *writeXMLPropertyList(Dictionary{}));
    contacts->enableSilently(true);
    EXPECT_FALSE(contacts->canBeEnabled());
    EXPECT_EQ(stored(), Dictionary{});
}

TEST_F(LocalAccountServiceTest, EntriesOfTheWrongTypeCountAsAbsentAndDoNotCrash) {
    for (const Dictionary& content :
         {Dictionary{{"Accounts", "text"}}, Dictionary{{"Accounts", Dictionary{{"anna", 1}}}},
          Dictionary{{"Accounts", Dictionary{{"anna", Dictionary{{"Services", PropertyList::Array{}}}}}}},
          Dictionary{{"LoggedInAccount", 42}}}) {
        root.addFile(kFile, *writeXMLPropertyList(content));
        EXPECT_EQ(service.loggedInAccount(), nullptr);
        const auto account = service.accountForID("anna", true);
        ASSERT_NE(account, nullptr);
        EXPECT_FALSE(service.isServiceEnabled(account.get(), kSKServiceIDContacts));
        account->serviceForID(kSKServiceIDContacts);
    }
}

TEST_F(LocalAccountServiceTest, ALoggedInAccountThatDoesNotExistIsNone) {
    root.addFile(kFile, *writeXMLPropertyList(Dictionary{{"LoggedInAccount", "anna"}}));
    EXPECT_EQ(service.loggedInAccount(), nullptr);
}

TEST_F(LocalAccountServiceTest, ADamagedFileCountsAsEmptyAndIsSetAsideBeforeTheFirstChange) {
    root.addFile(kFile, "<plist><dict><key>torn");
    EXPECT_EQ(service.accountForID("anna", false), nullptr);
    EXPECT_EQ(root.content(kFile), "<plist><dict><key>torn"); // a question changes nothing
    ASSERT_NE(service.accountForID("anna", true), nullptr);
    EXPECT_EQ(root.names(kFolder), (Names{"Accounts.plist", "Accounts.plist.damaged"}));
    EXPECT_EQ(root.content(kFolder + "/Accounts.plist.damaged"), "<plist><dict><key>torn");
    const std::string folder = root.locate(kFolder);
    ASSERT_EQ(log.records().size(), 1U);
    EXPECT_EQ(log.records().front().priority, 115);
    EXPECT_EQ(log.lines().front(),
              "The accounts in " + folder +
                  " are damaged (line 1, column 14: unterminated element <key>) and now at " + folder +
                  "/Accounts.plist.damaged");
}

TEST_F(LocalAccountServiceTest, ADamagedFileThatCannotBeSetAsideIsLeftAsItIsWithALine) {
    root.addFile(kFile, "<plist><dict><key>torn");
    root.addFile(kFile + ".damaged", "");
    for (int number = 2; number <= 1000; ++number) {
        root.addFile(kFile + ".damaged-" + std::to_string(number), "");
    }
    EXPECT_EQ(service.accountForID("anna", true), nullptr);
    EXPECT_EQ(root.content(kFile), "<plist><dict><key>torn");
    ASSERT_EQ(log.lines().size(), 2U);
    EXPECT_TRUE(log.lines()[0].ends_with(" and still in their place")) << log.lines()[0];
    EXPECT_TRUE(log.lines()[1].starts_with("The accounts could not be stored: cannot set "))
        << log.lines()[1];
}

TEST_F(LocalAccountServiceTest, WhatCannotBeWrittenLeavesTheFileAsItIsWithALine) {
    ASSERT_NE(service.accountForID("anna", true), nullptr);
    const Dictionary before = stored();
    EXPECT_EQ(service.accountForID("bad\x01", true), nullptr);
    EXPECT_EQ(stored(), before);
    EXPECT_EQ(log.lines(), std::vector<std::string>{
                               "The accounts could not be stored: cannot write " + root.locate(kFile) +
                               ": Accounts/bad? is a key that holds U+0001, for which XML has no place"});
}

TEST_F(LocalAccountServiceTest, NoChangeOfAnotherProcessIsLost) {
    service.accountForID("anna", true);
    std::vector<pid_t> children;
    for (const std::string& identifier : WLNimbusAllSetupServiceIDs()) {
        children.push_back(start([&] {
            const auto own = service.accountForID("anna", false)->serviceForID(identifier);
            for (int round = 0; round < 51; ++round) {
                own->enableSilently(round % 2 == 0);
            }
            return 0;
        }));
    }
    for (const pid_t child : children) {
        EXPECT_EQ(waitFor(child), 0);
    }
    const auto account = service.accountForID("anna", false);
    ASSERT_NE(account, nullptr);
    for (const std::string& identifier : WLNimbusAllSetupServiceIDs()) {
        EXPECT_TRUE(service.isServiceEnabled(account.get(), identifier)) << identifier;
    }
}

TEST_F(LocalAccountServiceTest, AQuestionIsAnsweredFromTheFileAsAnotherProcessHasLeftIt) {
    const auto account = service.accountForID("anna", true);
    const auto contacts = account->serviceForID(kSKServiceIDContacts);
    for (const bool enabled : {true, false, true}) {
        EXPECT_EQ(waitFor(start([&] {
                      local::LocalAccountService other{
                          posix::RootFolder(root.path()), identity, time, time, center, log};
                      other.accountForID("anna", false)
                          ->serviceForID(kSKServiceIDContacts)
                          ->enableSilently(enabled);
                      return 0;
                  })),
                  0);
        EXPECT_EQ(service.isServiceEnabled(account.get(), kSKServiceIDContacts), enabled);
        // What was known here before is no part of a change that is made here now.
        account->serviceForID(kSKServiceIDMail)->enableSilently(enabled);
        EXPECT_EQ(service.isServiceEnabled(account.get(), kSKServiceIDContacts), enabled);
        EXPECT_EQ(service.isServiceEnabled(account.get(), kSKServiceIDMail), enabled);
    }
}

TEST_F(LocalAccountServiceTest, AFileOfTheSameSizeAndTimeIsReadAllTheSame) {
    const auto account = service.accountForID("anna", true);
    account->serviceForID(kSKServiceIDContacts)->enableSilently(true);
    ASSERT_TRUE(service.isServiceEnabled(account.get(), kSKServiceIDContacts));
    std::string content = root.content(kFile).value();
    struct stat before = {};
    ASSERT_EQ(::stat(root.locate(kFile).c_str(), &before), 0);
    content.replace(content.find("<true/>"), 7, "<real/>"); // what counts is that it is no longer true
    root.addFile(kFile, content);
    const timespec times[] = {before.st_atim, before.st_mtim};
    ASSERT_EQ(::utimensat(AT_FDCWD, root.locate(kFile).c_str(), times, 0), 0);
    EXPECT_FALSE(service.isServiceEnabled(account.get(), kSKServiceIDContacts));
}

TEST_F(LocalAccountServiceTest, AFileThatGoesIsDamagedOrIsMendedIsMetAsItIs) {
    const auto account = service.accountForID("anna", true);
    const std::string whole = root.content(kFile).value();
    root.addFile(kFile, "<plist><dict><key>torn");
    EXPECT_EQ(service.accountForID("anna", false), nullptr);
    root.addFile(kFile, whole);
    EXPECT_NE(service.accountForID("anna", false), nullptr);
    ASSERT_EQ(::unlink(root.locate(kFile).c_str()), 0);
    EXPECT_EQ(service.accountForID("anna", false), nullptr);
    root.addDirectory(kFile);
    EXPECT_EQ(service.accountForID("anna", false), nullptr);
    ASSERT_EQ(::rmdir(root.locate(kFile).c_str()), 0);
    root.addFile(kFile, whole);
    EXPECT_NE(service.accountForID("anna", false), nullptr);
}

TEST_F(LocalAccountServiceTest, AChangeThatCouldNotBeStoredIsNotRemembered) {
    const auto account = service.accountForID("anna", true);
    const std::string before = root.content(kFile).value();
    root.addDirectory(kFolder + "/.Accounts.plist.new"); // in the place of the new file
    account->serviceForID(kSKServiceIDContacts)->enableSilently(true);
    EXPECT_FALSE(service.isServiceEnabled(account.get(), kSKServiceIDContacts));
    EXPECT_EQ(service.accountForID("bert", true), nullptr);
    EXPECT_EQ(service.accountForID("bert", false), nullptr);
    EXPECT_EQ(root.content(kFile), before);
}

TEST_F(LocalAccountServiceTest, ThreadsAskAndChangeAtTheSameTime) {
    const auto account = service.accountForID("anna", true);
    std::vector<std::thread> threads;
    for (const char* identifier : {kSKServiceIDContacts, kSKServiceIDCalendars, kSKServiceIDReminders}) {
        threads.emplace_back([&account, identifier] {
            const auto own = account->serviceForID(identifier);
            for (int round = 0; round < 21; ++round) {
                own->enableSilently(round % 2 == 0);
                EXPECT_TRUE(own->canBeEnabled());
            }
        });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    for (const char* identifier : {kSKServiceIDContacts, kSKServiceIDCalendars, kSKServiceIDReminders}) {
        EXPECT_TRUE(service.isServiceEnabled(account.get(), identifier)) << identifier;
    }
}

TEST_F(LocalAccountServiceTest, KilledAtAnySystemCallOfAnEnablingTheFileIsWholeOldOrNew) {
    service.accountForID("anna", true);
    bool sawOld = false;
    bool sawNew = false;
    bool finished = false;
    for (int stops = 1; !finished; ++stops) {
        service.accountForID("anna", false)->serviceForID(kSKServiceIDContacts)->enableSilently(false);
        const std::optional<int> ended = killAtSystemCall(
            [&] {
                service.accountForID("anna", false)->serviceForID(kSKServiceIDContacts)->enableSilently(true);
                return 0;
            },
            stops);
        finished = ended.has_value();
        const auto account = service.accountForID("anna", false);
        ASSERT_NE(account, nullptr) << "killed at stop " << stops;
        ASSERT_EQ(stored().at("Accounts").find("anna")->find("Services")->dictionary()->size(), 10U);
        const bool isEnabled = service.isServiceEnabled(account.get(), kSKServiceIDContacts);
        sawOld = sawOld || !isEnabled;
        sawNew = sawNew || (isEnabled && !finished);
    }
    EXPECT_TRUE(sawOld);
    EXPECT_TRUE(sawNew);
    EXPECT_EQ(root.names(kFolder), Names{"Accounts.plist"});
}

} // namespace
} // namespace welcomer
