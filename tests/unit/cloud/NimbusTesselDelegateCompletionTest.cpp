// Completing a setup.

#include "cloud/NimbusTesselDelegate.h"
#include "cloud/WLNimbusServiceCatalogue.h"
#include "log/PCLogManager.h"
#include "tests/unit/cloud/NimbusTesselDelegateFixture.h"

#include <chrono>
#include <optional>
#include <string>
#include <vector>

namespace welcomer {
namespace {

TEST_F(NimbusTesselDelegateTest, CompletingSignsInAndEnablesThePreLoginServices) {
    answerWith(true, {{kSKPropertyAccountID, "anna"}}, 1s);
    EXPECT_TRUE(complete());
    EXPECT_EQ(lines().front(),
              "<NimbusTesselDelegate>: -[NimbusTesselDelegate "
              "completeSetupWithUsername:password:nimbusDictionary:selectedServices:justTheAccountAndKVS:"
              "window:error:] anna - *");
    EXPECT_EQ(fake.recorder.callsTo("AccountManager."),
              (Strings{"AccountManager.finishSignIn anna, secret", "AccountManager.accountForID anna, yes"}));
    EXPECT_EQ(fake.accountService.lastRequest, (Dictionary{{"cloud", "dictionary"}}));
    EXPECT_TRUE(fake.accountService.accounts["anna"][kSKServiceIDLOC].enabled);
    EXPECT_FALSE(fake.accountService.accounts["anna"][kSKServiceIDContacts].enabled);
}

TEST_F(NimbusTesselDelegateTest, CompletingObservesBeforeItsRequestAndNoLongerWhenItEnables) {
    std::vector<std::size_t> observersThen;
    fake.accountService.answerSignIn = [&](const auto&, const auto&, const auto&) {
        observersThen.push_back(observers());
        return std::optional(Answer{true, {{kSKPropertyAccountID, "anna"}}, 0ns, false});
    };
    PCLogManager::sharedManager().setObserver([&](const PCLogManager::Call& call) {
        if (call.message == "Enabling Nimbus Locator") {
            observersThen.push_back(observers());
        }
    });
    EXPECT_TRUE(complete());
    PCLogManager::sharedManager().setObserver({});
    EXPECT_EQ(observersThen, (std::vector<std::size_t>{2, 0}));
}

TEST_F(NimbusTesselDelegateTest, CompletingHearsANotificationThatComesWithItsRequest) {
    answerImmediately(true, {{kSKPropertyAccountID, "anna"}});
    EXPECT_TRUE(complete());
    EXPECT_EQ(slices(), 0U);
}

TEST_F(NimbusTesselDelegateTest, CompletingWaitsAgainAfterAValidation) {
    answerWith(true, {{kSKPropertyAccountID, "anna"}}, 1s);
    EXPECT_TRUE(validate());
    EXPECT_TRUE(complete());
    EXPECT_EQ(fake.virtualTime.now(), 2s);
}

TEST_F(NimbusTesselDelegateTest, CompletingEnablesForTheAccountThatTheNotificationNames) {
    answerWith(true, {{kSKPropertyAccountID, "other"}});
    EXPECT_TRUE(complete());
    EXPECT_EQ(fake.recorder.callsTo("AccountManager.accountForID"),
              Strings{"AccountManager.accountForID other, yes"});
}

TEST_F(NimbusTesselDelegateTest, CompletingTakesTheHandlersVerdictWithoutReadingAStatus) {
    answerWith(true, {{kSKPropertyAccountID, "anna"}, {"status", 2}});
    EXPECT_TRUE(complete());
    EXPECT_EQ(delegate.delegatesResponseDict(), std::nullopt);
}

TEST_F(NimbusTesselDelegateTest, CompletingWithAFailedSignInEnablesNothing) {
    answerWith(false, {{kSKPropertyAccountError, 0}}); // even an error of 0 stays a failure here
    EXPECT_FALSE(complete());
    EXPECT_FALSE(delegate.succeeded());
    EXPECT_EQ(fake.recorder.callsTo("AccountManager.accountForID"), Strings{});
    EXPECT_EQ(delegate.delegatesResponseDict(), std::nullopt);
}

TEST_F(NimbusTesselDelegateTest, CompletingWhileAnAccountIsLoggedInMakesNoSignIn) {
    fake.accountService.loggedIn = "somebody";
    EXPECT_TRUE(complete());
    EXPECT_EQ(fake.recorder.callsTo("AccountManager."), Strings{"AccountManager.accountForID anna, yes"});
    EXPECT_EQ(slices(), 0U);
    EXPECT_TRUE(fake.accountService.accounts["anna"][kSKServiceIDLOC].enabled);
}

TEST_F(NimbusTesselDelegateTest, CompletingWhileAnAccountIsLoggedInAwaitsNothingSoThatAValidationStillWaits) {
    fake.accountService.loggedIn = "anna";
    EXPECT_TRUE(complete());
    EXPECT_EQ(delegate.delegatesResponseDict(), std::nullopt);
    answerWith(false, {{kSKPropertyAccountError, 1}}, 1s);
    EXPECT_FALSE(validate());
    EXPECT_EQ(fake.virtualTime.now(), 1s);
}

TEST_F(NimbusTesselDelegateTest, CompletingWhileAnAccountIsLoggedInForgetsNoEndedOperation) {
    answerWith(true, {{"status", 0}}, 1s);
    EXPECT_TRUE(validate());
    fake.accountService.loggedIn = "anna";
    EXPECT_TRUE(complete());
    EXPECT_TRUE(validate()); // at once, with what the completion says of itself
    EXPECT_EQ(fake.virtualTime.now(), 1s);
    EXPECT_EQ(delegate.delegatesResponseDict(), (Dictionary{{kSKPropertyAccountID, "anna"}}));
}

TEST_F(NimbusTesselDelegateTest, CompletingWhileAnAccountIsLoggedInSucceedsAlsoAfterAFailedValidation) {
    answerWith(false, {{kSKPropertyAccountError, 1}});
    EXPECT_FALSE(validate());
    fake.accountService.loggedIn = "anna";
    EXPECT_TRUE(complete());
    EXPECT_TRUE(delegate.succeeded());
}

TEST_F(NimbusTesselDelegateTest, CompletingFailsWhenTheServicesCannotBeEnabledForWantOfAnAccount) {
    answerWith(true, {}); // names no account
    EXPECT_FALSE(complete());
    EXPECT_FALSE(delegate.succeeded());
    EXPECT_EQ(lines().back(), "Failed to retrieve SK_Account");
}

TEST_F(NimbusTesselDelegateTest, CompletingForTheAccountAndKeyValueStoreEnablesDocumentsAlone) {
    answerWith(true, {{kSKPropertyAccountID, "anna"}});
    EXPECT_TRUE(complete({}, true));
    EXPECT_EQ(fake.recorder.callsTo("CloudService.enable"),
              Strings{"CloudService.enableSilently " + std::string(kSKServiceMobileDocuments) + ", yes"});
}

TEST_F(NimbusTesselDelegateTest, CompletingPassesTheWindowOn) {
    const auto window = std::make_shared<Window>();
    answerWith(true, {{kSKPropertyAccountID, "anna"}});
    EXPECT_TRUE(complete(WLNimbusAllSetupServiceIDs(), false, window));
    EXPECT_EQ(fake.accountService.lastWindow, window.get());
}

TEST_F(NimbusTesselDelegateTest, TheShortCompletionIsForAllOfTheAccount) {
    answerWith(true, {{kSKPropertyAccountID, "anna"}});
    EXPECT_TRUE(delegate.completeSetupWithUsernamePasswordNimbusDictionarySelectedServicesWindowError(
        "anna", "secret", {}, {kSKServiceIDLOC}, nullptr, &error));
    EXPECT_TRUE(hasLine("Enabling Nimbus Locator"));
    EXPECT_TRUE(hasLine("User opted out of Nimbus Documents & Data"));
}

TEST_F(NimbusTesselDelegateTest, TheWholeStoryOnOneObject) {
    const Dictionary response{{"status", 0}, {"delegates", Dictionary{{"com.corvid.chatter", "aliases"}}}};
    answerWith(true, response, 300ms);
    EXPECT_TRUE(signIn());
    answerWith(true, {{kSKPropertyAccountID, "anna"}}, 300ms);
    EXPECT_TRUE(complete());
    EXPECT_EQ(delegate.delegatesResponseDict(), response); // the sign-in's, for the hand-off
}

} // namespace
} // namespace welcomer
