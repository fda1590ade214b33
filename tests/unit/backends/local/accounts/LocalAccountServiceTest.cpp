// Accounts in a file: every outcome of a sign-in.

#include "backends/local/accounts/LocalAccountService.h"
#include "backends/local/LocalNotificationCenter.h"
#include "cloud/WLNimbusServiceCatalogue.h"
#include "tests/unit/backends/local/accounts/LocalAccountServiceFixture.h"

#include <chrono>
#include <string>
#include <sys/stat.h>
#include <vector>

namespace welcomer {
namespace {

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

} // namespace
} // namespace welcomer
