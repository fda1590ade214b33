// What every account service must do.

#include "backends/local/LocalAccountService.h"
#include "backends/local/LocalNotificationCenter.h"
#include "backends/local/PasswordHash.h"
#include "propertylist/PropertyListWriter.h"
#include "tests/contract/TemporaryRoot.h"
#include "tests/contract/TimeBackends.h"
#include "tests/fakes/FakeAccountService.h"
#include "tests/fakes/FakeFileSystem.h"
#include "tests/fakes/FakeNotificationCenter.h"
#include "tests/fakes/FakeProcessIdentity.h"

#include <gtest/gtest.h>

#include <chrono>
#include <map>
#include <memory>
#include <set>
#include <string>
#include <thread>
#include <vector>

namespace welcomer::contract {
namespace {

using namespace platform;
using namespace std::chrono_literals;

// The accounts that a new user gets have contacts, which can be enabled, and mail, which cannot and has the
// address anna@example.org.
template <typename Time>
struct LocalAccounts {
    LocalAccounts() { root.addDirectory("/home/user/Library"); }

    void addUser(const std::string& name, const std::string& password) {
        users[name] = PropertyList::Dictionary{
            {"Password", local::makePasswordHash(password).value()},
            {"MailAddress", "anna@example.org"},
            {"Services",
             PropertyList::Dictionary{
                 {kSKServiceIDContacts, PropertyList::Dictionary{}},
                 {kSKServiceIDMail, PropertyList::Dictionary{{"CanBeEnabled", false},
                                                             {"Properties", PropertyList::Dictionary{}}}}}}};
        root.addFile(local::kNimbusDirectoryPath,
                     *writeXMLPropertyList(PropertyList::Dictionary{{"Users", users}}));
    }

    Time time;
    TemporaryRoot root;
    PropertyList::Dictionary users;
    fakes::CallRecorder recorder;
    fakes::FakeFileSystem fileSystem{recorder};
    fakes::FakeProcessIdentity identity{recorder, fileSystem};
    local::LocalNotificationCenter center;
    local::LocalAccountService service{local::RootFolder(root.path()), identity, time.runLoops,
                                       time.dispatchQueues, center};
};

struct FakeAccounts {
    FakeAccounts() {
        const auto answer = [this](const std::string& name, const std::string& password, const auto&) {
            const bool isRight = passwords.contains(name) && passwords[name] == password;
            return std::optional(fakes::FakeAccountService::Answer{
                isRight,
                isRight ? PropertyList::Dictionary{{kSKPropertyAccountID, name}, {"status", 0}}
                        : PropertyList::Dictionary{{kSKPropertyAccountError, 1}},
                1ms, false});
        };
        service.answerAuthenticate = answer;
        service.answerSignIn = answer;
    }

    void addUser(const std::string& name, const std::string& password) {
        passwords[name] = password;
        service.servicesOfNewAccounts[kSKServiceIDContacts] = {};
        service.servicesOfNewAccounts[kSKServiceIDMail] = {
            false, false, {{kSKPropertyMailEmailAddress, "anna@example.org"}}};
    }

    SimulatedTime time;
    std::map<std::string, std::string> passwords;
    fakes::CallRecorder recorder;
    fakes::FakeNotificationCenter center;
    fakes::FakeAccountService service{recorder, center, time.runLoops, time.dispatchQueues};
};

struct BackendNames {
    template <typename Backend>
    static std::string GetName(int) {
        return std::is_same_v<Backend, FakeAccounts>               ? "Fake"
               : std::is_same_v<Backend, LocalAccounts<LocalTime>> ? "Local"
                                                                   : "LocalOnSimulatedTime";
    }
};

template <typename Backend>
class AccountServiceContract : public testing::Test {
  protected:
    AccountServiceContract() {
        backend.addUser("anna", "secret");
        for (const char* name : {kSKNotificationAuthenticationCompleted, kSKNotificationAuthenticationFailed,
                                 kSKNotificationSignInCompleted, kSKNotificationSignInFailed}) {
            observations.push_back(backend.center.addObserver(name, [this](const Notification& notification) {
                notifications.push_back(notification);
                threads.push_back(std::this_thread::get_id());
            }));
        }
    }

    std::shared_ptr<CloudAccount> make(const std::string& name) { return manager.accountForID(name, true); }

    // Runs the loop until nothing is under way any more.
    void finish() { backend.time.runLoops.current()->run(tooLong); }

    // The one notification that has come.
    Notification only() {
        EXPECT_EQ(notifications.size(), 1U);
        return notifications.empty() ? Notification{} : notifications.front();
    }

    Backend backend;
    AccountService& service = backend.service;
    AccountManager& manager = service.sharedManager();
    std::vector<Notification> notifications;
    std::vector<std::thread::id> threads;
    std::vector<std::unique_ptr<NotificationObservation>> observations;
};

using Backends = testing::Types<LocalAccounts<LocalTime>, LocalAccounts<SimulatedTime>, FakeAccounts>;
TYPED_TEST_SUITE(AccountServiceContract, Backends, BackendNames);

TYPED_TEST(AccountServiceContract, ThereIsNoAccountForNoneForAnEmptyNameOrForWhatIsNoString) {
    for (const bool create : {false, true}) {
        EXPECT_EQ(this->manager.accountForID(std::nullopt, create), nullptr);
        EXPECT_EQ(this->manager.accountForID("", create), nullptr);
        EXPECT_EQ(this->manager.accountForID(42, create), nullptr);
        EXPECT_EQ(this->manager.accountForID(PropertyList::Dictionary{}, create), nullptr);
    }
}

TYPED_TEST(AccountServiceContract, AMissingAccountIsMadeOnlyWhenAskedFor) {
    EXPECT_EQ(this->manager.accountForID("anna", false), nullptr);
    const auto made = this->manager.accountForID("anna", true);
    ASSERT_NE(made, nullptr);
    EXPECT_EQ(made->accountID(), "anna");
    ASSERT_NE(this->manager.accountForID("anna", false), nullptr);
    EXPECT_EQ(this->manager.accountForID("anna", false)->accountID(), "anna");
    EXPECT_EQ(this->manager.accountForID("bert", false), nullptr);
}

TYPED_TEST(AccountServiceContract, MakingAnAccountThatExistsChangesNothing) {
    this->make("anna")->serviceForID(kSKServiceIDContacts)->enableSilently(true);
    EXPECT_TRUE(this->service.isServiceEnabled(this->make("anna").get(), kSKServiceIDContacts));
}

TYPED_TEST(AccountServiceContract, AnAccountHasTheServicesThatItHas) {
    const auto account = this->make("anna");
    EXPECT_NE(account->serviceForID(kSKServiceIDContacts), nullptr);
    EXPECT_EQ(account->serviceForID(kSKServiceIDNotes), nullptr);
    EXPECT_EQ(account->serviceForID(""), nullptr);
}

TYPED_TEST(AccountServiceContract, AServiceSaysWhetherItCanBeEnabled) {
    const auto account = this->make("anna");
    EXPECT_TRUE(account->serviceForID(kSKServiceIDContacts)->canBeEnabled());
    EXPECT_FALSE(account->serviceForID(kSKServiceIDMail)->canBeEnabled());
}

TYPED_TEST(AccountServiceContract, AServiceHasItsProperties) {
    const auto account = this->make("anna");
    EXPECT_EQ(account->serviceForID(kSKServiceIDMail)->propertyValue(kSKPropertyMailEmailAddress),
              PropertyList("anna@example.org"));
    EXPECT_EQ(account->serviceForID(kSKServiceIDMail)->propertyValue("other"), std::nullopt);
    EXPECT_EQ(account->serviceForID(kSKServiceIDContacts)->propertyValue(kSKPropertyMailEmailAddress),
              std::nullopt);
}

TYPED_TEST(AccountServiceContract, EnablingAndDisablingASilentServiceOrOneWithAWindow) {
    const auto account = this->make("anna");
    const auto contacts = account->serviceForID(kSKServiceIDContacts);
    const auto isEnabled = [&] {
        return this->service.isServiceEnabled(account.get(), kSKServiceIDContacts);
    };
    EXPECT_FALSE(isEnabled());
    contacts->enableSilently(true);
    EXPECT_TRUE(isEnabled());
    contacts->enableSilently(false);
    EXPECT_FALSE(isEnabled());
    Window window;
    contacts->enableWithWindow(true, true, &window);
    EXPECT_TRUE(isEnabled());
    contacts->enableWithWindow(true, true, &window);
    EXPECT_TRUE(isEnabled());
    contacts->enableWithWindow(false, false, nullptr);
    EXPECT_FALSE(isEnabled());
}

TYPED_TEST(AccountServiceContract, EnablingConcernsOneServiceOfOneAccount) {
    const auto anna = this->make("anna");
    const auto bert = this->make("bert");
    anna->serviceForID(kSKServiceIDContacts)->enableSilently(true);
    EXPECT_FALSE(this->service.isServiceEnabled(anna.get(), kSKServiceIDMail));
    EXPECT_FALSE(this->service.isServiceEnabled(bert.get(), kSKServiceIDContacts));
}

TYPED_TEST(AccountServiceContract, AServiceMayBeEnabledAfterItsAccountsHandleIsGone) {
    auto account = this->make("anna");
    const auto contacts = account->serviceForID(kSKServiceIDContacts);
    account.reset();
    contacts->enableSilently(true);
    EXPECT_TRUE(this->service.isServiceEnabled(this->make("anna").get(), kSKServiceIDContacts));
}

TYPED_TEST(AccountServiceContract, AServiceMayBeEnabledFromAnotherThread) {
    const auto account = this->make("anna");
    std::thread([&] { account->serviceForID(kSKServiceIDContacts)->enableSilently(true); }).join();
    EXPECT_TRUE(this->service.isServiceEnabled(account.get(), kSKServiceIDContacts));
}

TYPED_TEST(AccountServiceContract, NoServiceIsEnabledForNoAccountNorOneThatTheAccountDoesNotHave) {
    EXPECT_FALSE(this->service.isServiceEnabled(nullptr, kSKServiceIDContacts));
    EXPECT_FALSE(this->service.isServiceEnabled(this->make("anna").get(), kSKServiceIDNotes));
}

TYPED_TEST(AccountServiceContract, SuppressingDialogsChangesNoService) {
    const auto account = this->make("anna");
    account->suppressFailureDialogs();
    EXPECT_FALSE(this->service.isServiceEnabled(account.get(), kSKServiceIDContacts));
}

TYPED_TEST(AccountServiceContract, NobodyIsLoggedInAtFirstNorBecauseAnAccountExists) {
    EXPECT_EQ(this->service.loggedInAccount(), nullptr);
    this->make("anna");
    EXPECT_EQ(this->service.loggedInAccount(), nullptr);
}

TYPED_TEST(AccountServiceContract, AuthenticatingWithTheRightPasswordCompletesAndLogsNobodyIn) {
    this->manager.authenticate("anna", "secret", {});
    this->finish();
    EXPECT_EQ(this->only().name, kSKNotificationAuthenticationCompleted);
    EXPECT_EQ(this->only().contents.at("status"), PropertyList(0));
    EXPECT_EQ(this->service.loggedInAccount(), nullptr);
}

TYPED_TEST(AccountServiceContract, AuthenticatingWithAnotherPasswordFails) {
    this->manager.authenticate("anna", "Secret", {});
    this->finish();
    EXPECT_EQ(this->only().name, kSKNotificationAuthenticationFailed);
    EXPECT_TRUE(this->only().contents.contains(kSKPropertyAccountError));
}

TYPED_TEST(AccountServiceContract, SigningInMakesTheAccountAndLogsItIn) {
    this->manager.finishSignIn("anna", "secret", {});
    this->finish();
    EXPECT_EQ(this->only().name, kSKNotificationSignInCompleted);
    EXPECT_EQ(this->only().contents.at(kSKPropertyAccountID), PropertyList("anna"));
    ASSERT_NE(this->service.loggedInAccount(), nullptr);
    EXPECT_EQ(this->service.loggedInAccount()->accountID(), "anna");
    EXPECT_NE(this->manager.accountForID("anna", false), nullptr);
}

TYPED_TEST(AccountServiceContract, SigningInKeepsWhatIsEnabledInTheAccount) {
    this->make("anna")->serviceForID(kSKServiceIDContacts)->enableSilently(true);
    this->manager.finishSignIn("anna", "secret", {});
    this->finish();
    EXPECT_TRUE(this->service.isServiceEnabled(this->service.loggedInAccount().get(), kSKServiceIDContacts));
}

TYPED_TEST(AccountServiceContract, AFailedSignInMakesNoAccountAndLogsNobodyIn) {
    for (const char* name : {"anna", "nobody"}) {
        this->manager.finishSignIn(name, "wrong", {});
        this->finish();
        EXPECT_EQ(this->notifications.back().name, kSKNotificationSignInFailed);
        EXPECT_EQ(this->manager.accountForID(name, false), nullptr);
    }
    EXPECT_EQ(this->notifications.size(), 2U);
    EXPECT_EQ(this->service.loggedInAccount(), nullptr);
}

TYPED_TEST(AccountServiceContract, TheAnswerComesOnTheRunLoopOfTheThreadThatAskedAndNotBefore) {
    this->manager.authenticate("anna", "secret", {});
    EXPECT_EQ(this->notifications.size(), 0U);
    this->finish();
    ASSERT_EQ(this->threads.size(), 1U);
    EXPECT_EQ(this->threads[0], std::this_thread::get_id());
}

TYPED_TEST(AccountServiceContract, ThePendingOperationKeepsTheLoopRunningUntilTheAnswerAndNoLonger) {
    this->manager.authenticate("anna", "secret", {});
    this->finish(); // not `tooLong`: with a port left, the test would time out or time would have passed
    EXPECT_EQ(this->notifications.size(), 1U);
    const auto before = this->backend.time.clock.now();
    this->finish();
    EXPECT_LT(this->backend.time.clock.now() - before, tooLong);
}

TYPED_TEST(AccountServiceContract, SeveralOperationsMayBeUnderWay) {
    this->manager.authenticate("anna", "secret", {});
    this->manager.authenticate("anna", "wrong", {});
    this->manager.finishSignIn("anna", "secret", {});
    this->finish();
    std::multiset<std::string> names;
    for (const Notification& notification : this->notifications) {
        names.insert(notification.name);
    }
    EXPECT_EQ(names, (std::multiset<std::string>{kSKNotificationAuthenticationCompleted,
                                                 kSKNotificationAuthenticationFailed,
                                                 kSKNotificationSignInCompleted}));
}

TYPED_TEST(AccountServiceContract, SetupMayBeMarkedFinished) {
    this->make("anna")->serviceForID(kSKServiceIDContacts)->enableSilently(true);
    this->manager.markSetupFinished(std::nullopt);
    this->manager.markSetupFinished(std::nullopt);
    EXPECT_TRUE(this->service.isServiceEnabled(this->make("anna").get(), kSKServiceIDContacts));
}

} // namespace
} // namespace welcomer::contract
