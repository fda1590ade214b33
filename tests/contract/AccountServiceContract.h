// What every account service must do: a suite for whoever has one to instantiate with backends.

#pragma once

#include "platform/AccountService.h"
#include "platform/NotificationCenter.h"
#include "tests/contract/TimeBackends.h"

#include <gtest/gtest.h>

#include <chrono>
#include <memory>
#include <set>
#include <string>
#include <thread>
#include <vector>

namespace welcomer::contract {

using namespace platform;

// A backend has the members time, center and service, and addUser(name, password), which has somebody be able
// to sign in. The accounts that a new user gets have contacts, which can be enabled, and mail, which cannot
// and has the address anna@example.org.
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

TYPED_TEST_SUITE_P(AccountServiceContract);

TYPED_TEST_P(AccountServiceContract, ThereIsNoAccountForNoneForAnEmptyNameOrForWhatIsNoString) {
    for (const bool create : {false, true}) {
        EXPECT_EQ(this->manager.accountForID(std::nullopt, create), nullptr);
        EXPECT_EQ(this->manager.accountForID("", create), nullptr);
        EXPECT_EQ(this->manager.accountForID(42, create), nullptr);
        EXPECT_EQ(this->manager.accountForID(PropertyList::Dictionary{}, create), nullptr);
    }
}

TYPED_TEST_P(AccountServiceContract, AMissingAccountIsMadeOnlyWhenAskedFor) {
    EXPECT_EQ(this->manager.accountForID("anna", false), nullptr);
    const auto made = this->manager.accountForID("anna", true);
    ASSERT_NE(made, nullptr);
    EXPECT_EQ(made->accountID(), "anna");
    ASSERT_NE(this->manager.accountForID("anna", false), nullptr);
    EXPECT_EQ(this->manager.accountForID("anna", false)->accountID(), "anna");
    EXPECT_EQ(this->manager.accountForID("bert", false), nullptr);
}

TYPED_TEST_P(AccountServiceContract, MakingAnAccountThatExistsChangesNothing) {
    this->make("anna")->serviceForID(kSKServiceIDContacts)->enableSilently(true);
    EXPECT_TRUE(this->service.isServiceEnabled(this->make("anna").get(), kSKServiceIDContacts));
}

TYPED_TEST_P(AccountServiceContract, AnAccountHasTheServicesThatItHas) {
    const auto account = this->make("anna");
    EXPECT_NE(account->serviceForID(kSKServiceIDContacts), nullptr);
    EXPECT_EQ(account->serviceForID(kSKServiceIDNotes), nullptr);
    EXPECT_EQ(account->serviceForID(""), nullptr);
}

TYPED_TEST_P(AccountServiceContract, AServiceSaysWhetherItCanBeEnabled) {
    const auto account = this->make("anna");
    EXPECT_TRUE(account->serviceForID(kSKServiceIDContacts)->canBeEnabled());
    EXPECT_FALSE(account->serviceForID(kSKServiceIDMail)->canBeEnabled());
}

TYPED_TEST_P(AccountServiceContract, AServiceHasItsProperties) {
    const auto account = this->make("anna");
    EXPECT_EQ(account->serviceForID(kSKServiceIDMail)->propertyValue(kSKPropertyMailEmailAddress),
              PropertyList("anna@example.org"));
    EXPECT_EQ(account->serviceForID(kSKServiceIDMail)->propertyValue("other"), std::nullopt);
    EXPECT_EQ(account->serviceForID(kSKServiceIDContacts)->propertyValue(kSKPropertyMailEmailAddress),
              std::nullopt);
}

TYPED_TEST_P(AccountServiceContract, EnablingAndDisablingASilentServiceOrOneWithAWindow) {
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

TYPED_TEST_P(AccountServiceContract, EnablingConcernsOneServiceOfOneAccount) {
    const auto anna = this->make("anna");
    const auto bert = this->make("bert");
    anna->serviceForID(kSKServiceIDContacts)->enableSilently(true);
    EXPECT_FALSE(this->service.isServiceEnabled(anna.get(), kSKServiceIDMail));
    EXPECT_FALSE(this->service.isServiceEnabled(bert.get(), kSKServiceIDContacts));
}

TYPED_TEST_P(AccountServiceContract, AServiceMayBeEnabledAfterItsAccountsHandleIsGone) {
    auto account = this->make("anna");
    const auto contacts = account->serviceForID(kSKServiceIDContacts);
    account.reset();
    contacts->enableSilently(true);
    EXPECT_TRUE(this->service.isServiceEnabled(this->make("anna").get(), kSKServiceIDContacts));
}

TYPED_TEST_P(AccountServiceContract, AServiceMayBeEnabledFromAnotherThread) {
    const auto account = this->make("anna");
    std::thread([&] { account->serviceForID(kSKServiceIDContacts)->enableSilently(true); }).join();
    EXPECT_TRUE(this->service.isServiceEnabled(account.get(), kSKServiceIDContacts));
}

TYPED_TEST_P(AccountServiceContract, NoServiceIsEnabledForNoAccountNorOneThatTheAccountDoesNotHave) {
    EXPECT_FALSE(this->service.isServiceEnabled(nullptr, kSKServiceIDContacts));
    EXPECT_FALSE(this->service.isServiceEnabled(this->make("anna").get(), kSKServiceIDNotes));
}

TYPED_TEST_P(AccountServiceContract, SuppressingDialogsChangesNoService) {
    const auto account = this->make("anna");
    account->suppressFailureDialogs();
    EXPECT_FALSE(this->service.isServiceEnabled(account.get(), kSKServiceIDContacts));
}

TYPED_TEST_P(AccountServiceContract, NobodyIsLoggedInAtFirstNorBecauseAnAccountExists) {
    EXPECT_EQ(this->service.loggedInAccount(), nullptr);
    this->make("anna");
    EXPECT_EQ(this->service.loggedInAccount(), nullptr);
}

TYPED_TEST_P(AccountServiceContract, AuthenticatingWithTheRightPasswordCompletesAndLogsNobodyIn) {
    this->manager.authenticate("anna", "secret", {});
    this->finish();
    EXPECT_EQ(this->only().name, kSKNotificationAuthenticationCompleted);
    EXPECT_EQ(this->only().contents.at("status"), PropertyList(0));
    EXPECT_EQ(this->service.loggedInAccount(), nullptr);
}

TYPED_TEST_P(AccountServiceContract, AuthenticatingWithAnotherPasswordFails) {
    this->manager.authenticate("anna", "Secret", {});
    this->finish();
    EXPECT_EQ(this->only().name, kSKNotificationAuthenticationFailed);
    EXPECT_TRUE(this->only().contents.contains(kSKPropertyAccountError));
}

TYPED_TEST_P(AccountServiceContract, SigningInMakesTheAccountAndLogsItIn) {
    this->manager.finishSignIn("anna", "secret", {});
    this->finish();
    EXPECT_EQ(this->only().name, kSKNotificationSignInCompleted);
    EXPECT_EQ(this->only().contents.at(kSKPropertyAccountID), PropertyList("anna"));
    ASSERT_NE(this->service.loggedInAccount(), nullptr);
    EXPECT_EQ(this->service.loggedInAccount()->accountID(), "anna");
    EXPECT_NE(this->manager.accountForID("anna", false), nullptr);
}

TYPED_TEST_P(AccountServiceContract, SigningInKeepsWhatIsEnabledInTheAccount) {
    this->make("anna")->serviceForID(kSKServiceIDContacts)->enableSilently(true);
    this->manager.finishSignIn("anna", "secret", {});
    this->finish();
    EXPECT_TRUE(this->service.isServiceEnabled(this->service.loggedInAccount().get(), kSKServiceIDContacts));
}

TYPED_TEST_P(AccountServiceContract, AFailedSignInMakesNoAccountAndLogsNobodyIn) {
    for (const char* name : {"anna", "nobody"}) {
        this->manager.finishSignIn(name, "wrong", {});
        this->finish();
        EXPECT_EQ(this->notifications.back().name, kSKNotificationSignInFailed);
        EXPECT_EQ(this->manager.accountForID(name, false), nullptr);
    }
    EXPECT_EQ(this->notifications.size(), 2U);
    EXPECT_EQ(this->service.loggedInAccount(), nullptr);
}

TYPED_TEST_P(AccountServiceContract, TheAnswerComesOnTheRunLoopOfTheThreadThatAskedAndNotBefore) {
    this->manager.authenticate("anna", "secret", {});
    EXPECT_EQ(this->notifications.size(), 0U);
    this->finish();
    ASSERT_EQ(this->threads.size(), 1U);
    EXPECT_EQ(this->threads[0], std::this_thread::get_id());
}

TYPED_TEST_P(AccountServiceContract, ThePendingOperationKeepsTheLoopRunningUntilTheAnswerAndNoLonger) {
    this->manager.authenticate("anna", "secret", {});
    this->finish(); // not `tooLong`: with a port left, the test would time out or time would have passed
    EXPECT_EQ(this->notifications.size(), 1U);
    const auto before = this->backend.time.clock.now();
    this->finish();
    EXPECT_LT(this->backend.time.clock.now() - before, tooLong);
}

TYPED_TEST_P(AccountServiceContract, SeveralOperationsMayBeUnderWay) {
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

TYPED_TEST_P(AccountServiceContract, SetupMayBeMarkedFinished) {
    this->make("anna")->serviceForID(kSKServiceIDContacts)->enableSilently(true);
    this->manager.markSetupFinished(std::nullopt);
    this->manager.markSetupFinished(std::nullopt);
    EXPECT_TRUE(this->service.isServiceEnabled(this->make("anna").get(), kSKServiceIDContacts));
}

REGISTER_TYPED_TEST_SUITE_P(
    AccountServiceContract, ThereIsNoAccountForNoneForAnEmptyNameOrForWhatIsNoString,
    AMissingAccountIsMadeOnlyWhenAskedFor, MakingAnAccountThatExistsChangesNothing,
    AnAccountHasTheServicesThatItHas, AServiceSaysWhetherItCanBeEnabled, AServiceHasItsProperties,
    EnablingAndDisablingASilentServiceOrOneWithAWindow, EnablingConcernsOneServiceOfOneAccount,
    AServiceMayBeEnabledAfterItsAccountsHandleIsGone, AServiceMayBeEnabledFromAnotherThread,
    NoServiceIsEnabledForNoAccountNorOneThatTheAccountDoesNotHave, SuppressingDialogsChangesNoService,
    NobodyIsLoggedInAtFirstNorBecauseAnAccountExists,
    AuthenticatingWithTheRightPasswordCompletesAndLogsNobodyIn, AuthenticatingWithAnotherPasswordFails,
    SigningInMakesTheAccountAndLogsItIn, SigningInKeepsWhatIsEnabledInTheAccount,
    AFailedSignInMakesNoAccountAndLogsNobodyIn, TheAnswerComesOnTheRunLoopOfTheThreadThatAskedAndNotBefore,
    ThePendingOperationKeepsTheLoopRunningUntilTheAnswerAndNoLonger, SeveralOperationsMayBeUnderWay,
    SetupMayBeMarkedFinished);

} // namespace welcomer::contract
