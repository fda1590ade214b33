// What accounts in a file can do: every outcome of a sign-in, and survive other processes, kills and damage.

#include "backends/local/accounts/LocalAccountService.h"

#include "backends/local/LocalNotificationCenter.h"
#include "backends/local/LocalPlatform.h"
#include "backends/local/accounts/PasswordHash.h"
#include "cloud/NimbusTesselDelegate.h"
#include "cloud/WLNimbusServiceCatalogue.h"
#include "cloud/WLNimbusSetupWithDictionary.h"
#include "propertylist/PropertyListReader.h"
#include "propertylist/PropertyListWriter.h"
#include "tests/contract/TemporaryRoot.h"
#include "tests/contract/TimeBackends.h"
#include "tests/fakes/FakeFileSystem.h"
#include "tests/fakes/FakeProcessIdentity.h"
#include "tests/fakes/FakeSystemLog.h"

#include <gtest/gtest.h>

#include <cerrno>
#include <chrono>
#include <csignal>
#include <fcntl.h>
#include <functional>
#include <memory>
#include <string>
#include <sys/ptrace.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>
#include <vector>

namespace welcomer {
namespace {

using namespace platform;
using namespace std::chrono_literals;
using Dictionary = PropertyList::Dictionary;
using Names = std::vector<std::string>;

const std::string kFolder = "/home/user/Library/Accounts";
const std::string kFile = kFolder + "/Accounts.plist";

class LocalAccountServiceTest : public testing::Test {
  protected:
    LocalAccountServiceTest() {
        root.addDirectory("/home/user/Library");
        // One hash for all tests of a process: it is slow on purpose.
        addUser("anna", {});
        for (const char* name : {kSKNotificationAuthenticationCompleted, kSKNotificationAuthenticationFailed,
                                 kSKNotificationSignInCompleted, kSKNotificationSignInFailed}) {
            observations.push_back(center.addObserver(
                name, [this](const Notification& notification) { notifications.push_back(notification); }));
        }
    }

    // A user of the directory whose password is "secret".
    void addUser(const std::string& name, Dictionary user) {
        static const std::string hash = local::makePasswordHash("secret").value();
        user.emplace("Password", hash);
        users[name] = std::move(user);
        root.addFile(local::kNimbusDirectoryPath, *writeXMLPropertyList(Dictionary{{"Users", users}}));
    }

    Notification authenticate(const std::string& name = "anna", const std::string& password = "secret") {
        service.authenticate(name, password, {});
        return finish();
    }
    Notification signIn(const std::string& name = "anna", const std::string& password = "secret") {
        service.finishSignIn(name, password, {});
        return finish();
    }
    Notification finish() {
        time.current()->run(24h);
        EXPECT_FALSE(notifications.empty());
        return notifications.empty() ? Notification{} : notifications.back();
    }
    static PropertyList accountError(const Notification& notification) {
        const auto found = notification.contents.find(kSKPropertyAccountError);
        return found == notification.contents.end() ? PropertyList("none") : found->second;
    }

    Dictionary stored() const {
        const PropertyListReadResult result = readPropertyList(root.content(kFile).value_or("nothing"));
        EXPECT_TRUE(result) << result.error;
        return result && result.value->isDictionary() ? *result.value->dictionary() : Dictionary();
    }

    mode_t mode(const std::string& path) const {
        struct stat status = {};
        EXPECT_EQ(::stat(root.locate(path).c_str(), &status), 0);
        return status.st_mode & 07777U;
    }

    static pid_t start(const std::function<int()>& block) {
        const pid_t child = ::fork();
        if (child == 0) {
            ::_exit(block());
        }
        return child;
    }
    static int waitFor(pid_t child) {
        int status = 0;
        while (::waitpid(child, &status, 0) < 0 && errno == EINTR) {
        }
        return status;
    }

    TemporaryRoot root;
    Dictionary users;
    simulated::VirtualTime time;
    fakes::CallRecorder recorder;
    fakes::FakeFileSystem fileSystem{recorder};
    fakes::FakeProcessIdentity identity{recorder, fileSystem};
    local::LocalNotificationCenter center;
    fakes::FakeSystemLog log{recorder};
    local::LocalAccountService service{posix::RootFolder(root.path()), identity, time, time, center, log};
    std::vector<Notification> notifications;
    std::vector<std::unique_ptr<NotificationObservation>> observations;
};

TEST_F(LocalAccountServiceTest, TheFileIsTheUsersOwn) {
    service.accountForID("anna", true);
    EXPECT_EQ(mode(kFolder), 0700U);
    EXPECT_EQ(mode(kFile), 0600U);
    EXPECT_EQ(root.names(kFolder), Names{"Accounts.plist"});
}

TEST_F(LocalAccountServiceTest, NothingIsMadeByQuestions) {
    service.accountForID("anna", false);
    service.loggedInAccount();
    EXPECT_EQ(root.names("/home/user/Library"), Names{});
}

TEST_F(LocalAccountServiceTest, AnAccountOfAUserThatTheDirectoryDoesNotKnowHasEveryServiceAndNoAddress) {
    const auto account = service.accountForID("stranger", true);
    for (const std::string& identifier : WLNimbusAllSetupServiceIDs()) {
        const auto cloudService = account->serviceForID(identifier);
        ASSERT_NE(cloudService, nullptr) << identifier;
        EXPECT_TRUE(cloudService->canBeEnabled()) << identifier;
        EXPECT_FALSE(service.isServiceEnabled(account.get(), identifier)) << identifier;
    }
    EXPECT_EQ(account->serviceForID(kSKServiceIDMail)->propertyValue(kSKPropertyMailEmailAddress),
              std::nullopt);
}

TEST_F(LocalAccountServiceTest, AnAccountGetsItsUsersMailAddress) {
    addUser("anna", {{"MailAddress", "anna@example.org"}});
    EXPECT_EQ(service.accountForID("anna", true)
                  ->serviceForID(kSKServiceIDMail)
                  ->propertyValue(kSKPropertyMailEmailAddress),
              PropertyList("anna@example.org"));
}

TEST_F(LocalAccountServiceTest, AMailServiceThatHasAnAddressOfItsOwnKeepsIt) {
    const Dictionary properties{{kSKPropertyMailEmailAddress, "own@example.org"}};
    addUser("anna", {{"MailAddress", "anna@example.org"},
                     {"Services", Dictionary{{kSKServiceIDMail, Dictionary{{"Properties", properties}}}}}});
    EXPECT_EQ(service.accountForID("anna", true)
                  ->serviceForID(kSKServiceIDMail)
                  ->propertyValue(kSKPropertyMailEmailAddress),
              PropertyList("own@example.org"));
}

TEST_F(LocalAccountServiceTest, AnAccountGetsItsUsersServices) {
    addUser("anna", {{"Services", Dictionary{{kSKServiceIDLOC, Dictionary{{"CanBeEnabled", false}}}}}});
    const auto account = service.accountForID("anna", true);
    EXPECT_FALSE(account->serviceForID(kSKServiceIDLOC)->canBeEnabled());
    EXPECT_EQ(account->serviceForID(kSKServiceIDContacts), nullptr);
}

TEST_F(LocalAccountServiceTest, AnAccountIsMadeAlsoWithoutADirectory) {
    root.addFile(local::kNimbusDirectoryPath, "no property list {");
    ASSERT_NE(service.accountForID("anna", true), nullptr);
}

TEST_F(LocalAccountServiceTest, EverySuccessNamesTheAccount) {
    EXPECT_EQ(authenticate().contents, (Dictionary{{"status", 0}, {kSKPropertyAccountID, "anna"}}));
    EXPECT_EQ(notifications.back().sender, &service);
}

TEST_F(LocalAccountServiceTest, TheUsersResponseIsTheAnswer) {
    const Dictionary delegates{
        {"com.corvid.chatter", Dictionary{{"aliases", PropertyList::Array{"anna@example.org"}}}}};
    addUser("anna", {{"Response", Dictionary{{"status", 2}, {"delegates", delegates}}}});
    EXPECT_EQ(authenticate().name, kSKNotificationAuthenticationCompleted);
    EXPECT_EQ(notifications.back().contents,
              (Dictionary{{"status", 2}, {"delegates", delegates}, {kSKPropertyAccountID, "anna"}}));
}

TEST_F(LocalAccountServiceTest, WrongPasswordUnknownUserAndAMissingDirectoryHaveErrorsOfTheirOwn) {
    EXPECT_EQ(accountError(authenticate("anna", "wrong")), PropertyList(kSKAccountErrorWrongPassword));
    EXPECT_EQ(accountError(authenticate("anna", "")), PropertyList(kSKAccountErrorWrongPassword));
    EXPECT_EQ(accountError(authenticate("anna", std::string("secret\0x", 8))),
              PropertyList(kSKAccountErrorWrongPassword));
    EXPECT_EQ(accountError(authenticate("bert")), PropertyList(kSKAccountErrorUnknownUser));
    EXPECT_EQ(accountError(authenticate("")), PropertyList(kSKAccountErrorUnknownUser));
    root.addFile(local::kNimbusDirectoryPath, "");
    EXPECT_EQ(accountError(authenticate()), PropertyList(kSKAccountErrorServerUnavailable));
    for (const Notification& notification : notifications) {
        EXPECT_EQ(notification.name, kSKNotificationAuthenticationFailed);
        EXPECT_FALSE(notification.contents.contains(kSKPropertyAccountErrorInfo));
    }
}

TEST_F(LocalAccountServiceTest, AUserWithoutAPasswordOrWithAnUnusableHashHasNoRightPassword) {
    for (const PropertyList& hash : {PropertyList(""), PropertyList("*"), PropertyList("secret"),
                                     PropertyList(42), PropertyList("$y$broken")}) {
        addUser("bert", {{"Password", hash}});
        EXPECT_EQ(accountError(authenticate("bert")), PropertyList(kSKAccountErrorWrongPassword));
    }
    users["bert"] = Dictionary{};
    addUser("anna", {});
    EXPECT_EQ(accountError(authenticate("bert")), PropertyList(kSKAccountErrorWrongPassword));
    users["bert"] = "no dictionary";
    addUser("anna", {});
    EXPECT_EQ(accountError(authenticate("bert")), PropertyList(kSKAccountErrorWrongPassword));
}

TEST_F(LocalAccountServiceTest, AccountErrorsComeWithAndWithoutInfo) {
    for (const std::int64_t error :
         {kSKAccountErrorTermsOfService, kSKAccountErrorRepair, kSKAccountErrorNone}) {
        addUser("anna", {{"AccountError", error}});
        EXPECT_EQ(authenticate().name, kSKNotificationAuthenticationFailed);
        EXPECT_EQ(notifications.back().contents, // no status, which is a success's alone
                  (Dictionary{{kSKPropertyAccountError, error}, {kSKPropertyAccountID, "anna"}}));
        addUser("anna", {{"AccountError", error}, {"AccountErrorInfo", Dictionary{{"version", 7}}}});
        EXPECT_EQ(authenticate().contents.at(kSKPropertyAccountErrorInfo),
                  PropertyList(Dictionary{{"version", 7}}));
    }
}

TEST_F(LocalAccountServiceTest, AFailureMayComeWithoutAnAccountErrorAndWithAResponse) {
    addUser("anna", {{"Fails", true}, {"Response", Dictionary{{"status", 1}}}});
    EXPECT_EQ(authenticate().name, kSKNotificationAuthenticationFailed);
    EXPECT_EQ(notifications.back().contents, (Dictionary{{"status", 1}, {kSKPropertyAccountID, "anna"}}));
}

TEST_F(LocalAccountServiceTest, AResponseThatIsNoDictionaryIsNoSuccess) {
    addUser("anna", {{"Response", "fine"}});
    EXPECT_EQ(authenticate().name, kSKNotificationAuthenticationFailed);
    EXPECT_EQ(accountError(notifications.back()), PropertyList(kSKAccountErrorServerUnavailable));
}

TEST_F(LocalAccountServiceTest, AnOperationFailsUnlessItsFailureReadsAsFalse) {
    for (const PropertyList& fails : {PropertyList("yes"), PropertyList(1), PropertyList(Dictionary{})}) {
        addUser("anna", {{"Fails", fails}});
        EXPECT_EQ(authenticate().name, kSKNotificationAuthenticationFailed);
    }
    for (const PropertyList& fails : {PropertyList(false), PropertyList(0), PropertyList("0")}) {
        addUser("anna", {{"Fails", fails}});
        EXPECT_EQ(authenticate().name, kSKNotificationAuthenticationCompleted);
    }
}

TEST_F(LocalAccountServiceTest, AnErrorOfTheUsersIsToldOnlyToTheRightPassword) {
    addUser("anna", {{"AccountError", 5}});
    EXPECT_EQ(accountError(authenticate("anna", "wrong")), PropertyList(kSKAccountErrorWrongPassword));
}

TEST_F(LocalAccountServiceTest, TheAnswerTakesAsLongAsTheDirectorySays) {
    const std::pair<PropertyList, std::chrono::nanoseconds> delays[] = {
        {5, 5s}, {0.25, 250ms}, {-1, 0s}, {"soon", 0s}};
    for (const auto& [seconds, expected] : delays) {
        addUser("anna", {{"DelaySeconds", seconds}});
        const auto before = time.now();
        authenticate();
        EXPECT_EQ(time.now() - before, expected);
    }
}

TEST_F(LocalAccountServiceTest, ADelayBeyondEveryClockNeverAnswers) {
    addUser("anna", {{"DelaySeconds", 1e300}});
    service.authenticate("anna", "secret", {});
    time.current()->run(24h * 365 * 100);
    EXPECT_EQ(notifications.size(), 0U);
}

TEST_F(LocalAccountServiceTest, TheRunLoopIsHeldUntilTheAnswerAndNotWhileItIsHeard) {
    const auto listener = center.addObserver(kSKNotificationAuthenticationCompleted, [this](const auto&) {
        const auto before = time.now();
        time.current()->run(1h);
        EXPECT_EQ(time.now(), before);
    });
    EXPECT_EQ(authenticate().name, kSKNotificationAuthenticationCompleted);
}

TEST_F(LocalAccountServiceTest, ASignInThatCannotBeStoredFails) {
    root.addFile(kFolder, "a file in the folder's place");
    EXPECT_EQ(signIn().name, kSKNotificationSignInFailed);
    EXPECT_EQ(accountError(notifications.back()), PropertyList(kSKAccountErrorNotStored));
    const std::string reason = "cannot write to " + root.locate(kFolder) + ": Not a directory";
    EXPECT_EQ(notifications.back().contents.at(kSKPropertyAccountErrorInfo), PropertyList(reason));
    EXPECT_EQ(log.lines(), std::vector<std::string>{"The accounts could not be stored: " + reason});
    EXPECT_EQ(service.loggedInAccount(), nullptr);
}

TEST_F(LocalAccountServiceTest, ASecondSignInReplacesWhoIsLoggedInAndKeepsTheAccounts) {
    addUser("bert", {});
    signIn("anna");
    signIn("bert");
    EXPECT_EQ(service.loggedInAccount()->accountID(), "bert");
    EXPECT_NE(service.accountForID("anna", false), nullptr);
}

TEST_F(LocalAccountServiceTest, AFinishedSetupIsKept) {
    service.markSetupFinished(std::nullopt);
    EXPECT_EQ(stored(), (Dictionary{{"SetupFinished", true}}));
}

TEST_F(LocalAccountServiceTest, AnAnswerThatComesAfterTheServiceIsGoneIsDropped) {
    addUser("anna", {{"DelaySeconds", 1}});
    {
        local::LocalNotificationCenter ownCenter;
        local::LocalAccountService own{posix::RootFolder(root.path()), identity, time, time, ownCenter, log};
        own.authenticate("anna", "secret", {});
    }
    time.current()->run(2s);
    EXPECT_EQ(notifications.size(), 0U);
}

TEST_F(LocalAccountServiceTest, EnablingAServiceThatIsEnabledWritesNothing) {
    const auto contacts = service.accountForID("anna", true)->serviceForID(kSKServiceIDContacts);
    contacts->enableSilently(true);
    struct stat before = {};
    ::stat(root.locate(kFile).c_str(), &before);
    contacts->enableSilently(true);
    struct stat after = {};
    ::stat(root.locate(kFile).c_str(), &after);
    EXPECT_EQ(after.st_ino, before.st_ino); // a new file would have taken its place
}

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
        const pid_t child = start([&] {
            ::ptrace(PTRACE_TRACEME, 0, nullptr, nullptr);
            ::raise(SIGSTOP);
            service.accountForID("anna", false)->serviceForID(kSKServiceIDContacts)->enableSilently(true);
            return 0;
        });
        int status = waitFor(child);
        ASSERT_TRUE(WIFSTOPPED(status));
        for (int stop = 0; stop < stops && WIFSTOPPED(status); ++stop) {
            ASSERT_EQ(::ptrace(PTRACE_SYSCALL, child, nullptr, nullptr), 0);
            status = waitFor(child);
        }
        finished = WIFEXITED(status);
        if (!finished) {
            ASSERT_EQ(::kill(child, SIGKILL), 0);
            waitFor(child);
        }
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

// The module on the local platform, with real time.
class LocalSignInTest : public LocalAccountServiceTest {
  protected:
    LocalSignInTest() : owner({root.path(), &log}), installed(owner.platform()) {
        root.addDirectory(owner.platform().processIdentity.homeDirectory() + "/Library");
    }

    std::vector<std::string> enabled() {
        std::vector<std::string> result;
        AccountService& accounts = owner.platform().accountService;
        const auto account = accounts.sharedManager().accountForID("anna", false);
        for (const std::string& identifier : WLNimbusAllSetupServiceIDs()) {
            if (accounts.isServiceEnabled(account.get(), identifier)) {
                result.push_back(identifier);
            }
        }
        return result;
    }

    local::LocalPlatform owner;
    ScopedPlatform installed;
};

TEST_F(LocalSignInTest, SigningInAndCompletingEnablesThePreLoginServicesForReal) {
    addUser("anna",
            {{"DelaySeconds", 0.15}, {"Response", Dictionary{{"status", 0}, {"delegates", Dictionary{}}}}});
    NimbusTesselDelegate delegate;
    const auto before = std::chrono::steady_clock::now();
    EXPECT_TRUE(delegate.signInWithUsernameAndPasswordAdditionalDelegatesOmittingDelegatesError(
        "anna", "secret", {}, {}, nullptr));
    EXPECT_GE(std::chrono::steady_clock::now() - before, 150ms);
    EXPECT_EQ(delegate.delegatesResponseDict()->at("delegates"), PropertyList(Dictionary{}));
    EXPECT_TRUE(delegate.completeSetupWithUsernamePasswordNimbusDictionarySelectedServicesWindowError(
        "anna", "secret", {}, WLNimbusAllSetupServiceIDs(), nullptr, nullptr));
    EXPECT_EQ(enabled(), (Names{kSKServiceIDMediaStream, kSKServiceIDAccountSync, kSKServiceIDLOC,
                                kSKServiceMobileDocuments}));
    for (const std::string& line : log.lines()) {
        EXPECT_EQ(line.find("secret"), std::string::npos) << line;
    }
}

TEST_F(LocalSignInTest, AWrongPasswordIsAFalseResult) {
    NimbusTesselDelegate delegate;
    EXPECT_FALSE(delegate.validateNimbusUsernameAndPasswordError("anna", "wrong", nullptr));
    EXPECT_FALSE(delegate.needsRepair());
}

TEST_F(LocalSignInTest, ADelayedEnablingWhoseProcessEndsFirstNeverHappens) {
    const pid_t child = start([&] {
        return WLNimbusSetupWithDictionary2({{kSKPropertyAccountID, "anna"}}, WLNimbusAllSetupServiceIDs(),
                                            false, true, nullptr, nullptr)
                   ? 0
                   : 1;
    });
    EXPECT_EQ(waitFor(child), 0);
    EXPECT_EQ(enabled(), (Names{kSKServiceIDContacts, kSKServiceIDBookMarks}));
}

TEST_F(LocalSignInTest, ADelayedEnablingOfAProcessThatLivesLongEnoughHappens) {
    const std::string preferences =
        owner.platform().processIdentity.homeDirectory() + "/Library/Preferences/com.corvid.welcomer.plist";
    root.addFile(preferences, *writeXMLPropertyList(Dictionary{{"WLDebugPostLoginDelay", 1}}));
    const auto before = std::chrono::steady_clock::now();
    EXPECT_TRUE(WLNimbusSetupWithDictionary2({{kSKPropertyAccountID, "anna"}}, {kSKServiceIDCalendars}, false,
                                             true, nullptr, nullptr));
    EXPECT_EQ(enabled(), Names{});
    while (enabled().empty() && std::chrono::steady_clock::now() - before < 60s) {
        std::this_thread::sleep_for(10ms);
    }
    EXPECT_EQ(enabled(), Names{kSKServiceIDCalendars});
    EXPECT_GE(std::chrono::steady_clock::now() - before, 1s);
}

TEST(PasswordHashTest, AHashMatchesItsPasswordAloneAndIsYescrypt) {
    const std::string hash = local::makePasswordHash("secret").value();
    EXPECT_TRUE(hash.starts_with("$y$"));
    EXPECT_TRUE(local::passwordMatches("secret", hash));
    EXPECT_FALSE(local::passwordMatches("secret ", hash));
    EXPECT_FALSE(local::passwordMatches("", hash));
    EXPECT_FALSE(local::passwordMatches("secret", ""));
    EXPECT_FALSE(local::passwordMatches("secret", hash + "x"));
}

TEST(PasswordHashTest, EveryHashHasASaltOfItsOwn) {
    EXPECT_NE(local::makePasswordHash("secret"), local::makePasswordHash("secret"));
}

TEST(PasswordHashTest, APasswordWithANULHasNoHash) {
    EXPECT_EQ(local::makePasswordHash(std::string("a\0b", 3)), std::nullopt);
}

TEST(PasswordHashTest, TheSystemsOtherHashesMatchToo) {
    // "secret" in SHA-512, as many systems keep it.
    const std::string hash =
        "$6$saltsalt$TVLlQcbpFVof5W3Yz4DTP6gRstiNuHwwTt6GLc1E5n0U0aDehy0S5knV8wiOQSpT0Y77vwPZN.Pq.H91p5hVO1";
    EXPECT_TRUE(local::passwordMatches("secret", hash));
    EXPECT_FALSE(local::passwordMatches("other", hash));
}

} // namespace
} // namespace welcomer
