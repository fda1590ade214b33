// Signing in beside the online accounts.

#include "tests/contract/TimeBackends.h"
#include "tests/unit/backends/desktop/accounts/OnlineAccountServiceFixture.h"

#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

namespace welcomer::contract {
namespace {

TEST_F(OnlineAccountServiceTest, ACompletedSignInMakesTheOnlineAccountBeforeItIsTold) {
    backend.addUser("anna", "secret");
    const auto seen = signIn("anna", "secret", [this] { return std::to_string(online.made.size()); });
    ASSERT_EQ(seen,
              (std::vector<std::pair<std::string, std::string>>{{kSKNotificationSignInCompleted, "1"}}));
    ASSERT_EQ(online.made.size(), 1U);
    EXPECT_EQ(online.made[0].providerType, "owncloud");
    EXPECT_EQ(online.made[0].identity, "anna");
    EXPECT_EQ(online.made[0].password.text(), "secret");
    EXPECT_EQ(online.made[0].serverAddress, "https://cloud.example/");
    EXPECT_EQ(loggedIn(), "anna");
}

TEST_F(OnlineAccountServiceTest, TheOnlineAccountBeginsWithNothingOnButWhatIsEnabledAlready) {
    EXPECT_EQ(signIn("bert", "none").at(0).first, kSKNotificationSignInFailed);
    backend.addUser("anna", "secret");
    backend.service.accountForID("anna", true)->serviceForID(kSKServiceIDContacts)->enableSilently(true);
    signIn("anna", "secret");
    EXPECT_TRUE(isOn(0, OnlineFeature::Contacts));
    EXPECT_FALSE(isOn(0, OnlineFeature::Calendar));
    EXPECT_FALSE(isOn(0, OnlineFeature::Files));
}

TEST_F(OnlineAccountServiceTest, SigningInAgainMakesNoOtherOnlineAccount) {
    backend.addUser("anna", "secret");
    signIn("anna", "secret");
    signIn("anna", "secret");
    EXPECT_EQ(online.made.size(), 1U);
    EXPECT_EQ(loggedIn(), "anna");
}

TEST_F(OnlineAccountServiceTest, AFailedSignInMakesNoOnlineAccount) {
    backend.addUser("anna", "secret");
    EXPECT_EQ(signIn("anna", "wrong").at(0).first, kSKNotificationSignInFailed);
    EXPECT_EQ(online.made.size(), 0U);
    EXPECT_EQ(online.questions, 0);
}

TEST_F(OnlineAccountServiceTest, AuthenticatingMakesNoOnlineAccount) {
    backend.addUser("anna", "secret");
    backend.service.authenticate("anna", "secret", {});
    backend.time.runLoops.current()->run(tooLong);
    EXPECT_EQ(askedFor, 0);
}

TEST_F(OnlineAccountServiceTest, ASignInWhoseOnlineAccountCannotBeMadeCompletesAllTheSame) {
    backend.addUser("anna", "secret");
    online.canWrite = false;
    EXPECT_EQ(signIn("anna", "secret").at(0).first, kSKNotificationSignInCompleted);
    EXPECT_EQ(loggedIn(), "anna");
    EXPECT_TRUE(backend.preferenceStore.stored(desktop::kOnlineAccountsDomain).empty());
    online.isServing = false;
    EXPECT_EQ(signIn("anna", "secret").at(0).first, kSKNotificationSignInCompleted);
    isThere = false;
    EXPECT_EQ(signIn("anna", "secret").at(0).first, kSKNotificationSignInCompleted);
    EXPECT_EQ(loggedIn(), "anna");
}

TEST_F(OnlineAccountServiceTest, WhoRemovesTheOnlineAccountIsNoLongerLoggedIn) {
    backend.addUser("anna", "secret");
    signIn("anna", "secret");
    online.accounts.clear();
    online.add("owncloud", "bert", true);
    online.add("imap_smtp", "anna", true);
    EXPECT_EQ(loggedIn(), "nobody");
    EXPECT_NE(backend.service.accountForID("anna", false), nullptr);
    signIn("anna", "secret");
    EXPECT_EQ(online.made.size(), 2U);
    EXPECT_EQ(loggedIn(), "anna");
}

TEST_F(OnlineAccountServiceTest, TheLogInIsRememberedForOtherProcesses) {
    backend.addUser("anna", "secret");
    signIn("anna", "secret");
    EXPECT_EQ(backend.preferenceStore.stored(desktop::kOnlineAccountsDomain),
              (PropertyList::Dictionary{{"anna", true}}));
}

TEST_F(OnlineAccountServiceTest, WhileNobodyServesTheOnlineAccountsTheLogInStands) {
    backend.addUser("anna", "secret");
    signIn("anna", "secret");
    online.accounts.clear();
    online.isServing = false;
    EXPECT_EQ(loggedIn(), "anna");
    isThere = false;
    EXPECT_EQ(loggedIn(), "anna");
}

TEST_F(OnlineAccountServiceTest, AServiceThatEndsDuringASignInTellsNothing) {
    backend.addUser("anna", "secret");
    int told = 0;
    const auto observation = backend.center.addObserver(
        kSKNotificationSignInCompleted, [&](const Notification& /*notification*/) { ++told; });
    for (const bool isLate : {false, true}) {
        auto another = backend.makeService();
        online.whileMaking = [&] {
            another.reset();
        };
        another->finishSignIn("anna", "secret", {});
        if (!isLate) {
            another.reset();
        }
        backend.time.runLoops.current()->run(tooLong);
        EXPECT_EQ(another, nullptr);
        EXPECT_EQ(told, 0);
    }
    EXPECT_EQ(online.made.size(), 1U);
}

TEST_F(OnlineAccountServiceTest, AnObserverMayStartTheNextSignIn) {
    backend.addUser("anna", "secret");
    Names names;
    std::vector<std::unique_ptr<NotificationObservation>> observations;
    for (const char* end : {kSKNotificationSignInCompleted, kSKNotificationSignInFailed}) {
        observations.push_back(backend.center.addObserver(end, [&](const Notification& notification) {
            names.push_back(notification.name);
            if (names.size() < 3) {
                backend.service.finishSignIn("anna", names.size() == 1 ? "wrong" : "secret", {});
            }
        }));
    }
    backend.service.finishSignIn("anna", "secret", {});
    backend.time.runLoops.current()->run(tooLong);
    EXPECT_EQ(names, (Names{kSKNotificationSignInCompleted, kSKNotificationSignInFailed,
                            kSKNotificationSignInCompleted}));
}

TEST_F(OnlineAccountServiceTest, NobodyAsksForTheOnlineAccountsBeforeTheyAreNeeded) {
    EXPECT_EQ(loggedIn(), "nobody");
    backend.service.markSetupFinished(std::nullopt);
    bert()->suppressFailureDialogs();
    EXPECT_TRUE(serviceOfBert(kSKServiceIDContacts)->canBeEnabled());
    EXPECT_FALSE(backend.service.isServiceEnabled(nullptr, kSKServiceIDContacts));
    EXPECT_EQ(askedFor, 0);
}

} // namespace
} // namespace welcomer::contract
