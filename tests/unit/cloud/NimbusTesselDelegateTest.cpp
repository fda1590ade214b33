// What is asked for, and what is logged on the way.

#include "cloud/NimbusTesselDelegate.h"
#include "cloud/WLNimbusServiceCatalogue.h"
#include "log/PCLogManager.h"
#include "tests/unit/cloud/NimbusTesselDelegateFixture.h"
#include "tests/unit/plugins/InProcessPlugin.h"

#include <algorithm>
#include <optional>
#include <string>
#include <vector>

namespace welcomer {
namespace {

TEST_F(NimbusTesselDelegateTest, BeginsWithNothing) {
    EXPECT_FALSE(delegate.succeeded());
    EXPECT_FALSE(delegate.needsRepair());
    EXPECT_EQ(delegate.delegatesResponseDict(), std::nullopt);
}

TEST_F(NimbusTesselDelegateTest, AValidationThatSucceedsKeepsTheResponse) {
    const Dictionary response{{"status", 0}, {"delegates", Dictionary{}}};
    answerWith(true, response);
    EXPECT_TRUE(validate());
    EXPECT_TRUE(delegate.succeeded());
    EXPECT_EQ(delegate.delegatesResponseDict(), response);
    EXPECT_FALSE(delegate.needsRepair());
    EXPECT_EQ(lines(), (Strings{"<NimbusTesselDelegate>: -[NimbusTesselDelegate "
                                "validateNimbusUsername:andPassword:tosVersions:delegates:error:] anna",
                                "<NimbusTesselDelegate>: _validateOK: {delegates = {}; status = 0}"}));
    EXPECT_EQ(fake.recorder.callsTo("AccountManager."), Strings{"AccountManager.authenticate anna, secret"});
}

TEST_F(NimbusTesselDelegateTest, TheShortValidationAsksForTheMessagingAliasesAlone) {
    fakes::InProcessPlugin chatter{"com.corvid.chatter"};
    fakes::InProcessPlugin store{"com.corvid.storefront"};
    installPlugin<0>(chatter);
    installPlugin<1>(store);
    validate();
    EXPECT_EQ(fake.accountService.lastRequest,
              (Dictionary{{"delegates",
                           Dictionary{{"com.corvid.skylark", Dictionary{}},
                                      {"com.corvid.chatter", Dictionary{{"from", "com.corvid.chatter"}}}}}}));
}

TEST_F(NimbusTesselDelegateTest, AValidationWithoutARequestAsksForEveryDelegate) {
    fakes::InProcessPlugin chatter{"com.corvid.chatter"};
    fakes::InProcessPlugin store{"com.corvid.storefront"};
    installPlugin<0>(chatter);
    installPlugin<1>(store);
    validateWith(std::nullopt, std::nullopt);
    EXPECT_EQ(
        fake.accountService.lastRequest,
        (Dictionary{{"delegates",
                     Dictionary{{"com.corvid.skylark", Dictionary{}},
                                {"com.corvid.chatter", Dictionary{{"from", "com.corvid.chatter"}}},
                                {"com.corvid.storefront", Dictionary{{"from", "com.corvid.storefront"}}}}}}));
}

TEST_F(NimbusTesselDelegateTest, AValidationsOwnRequestIsSentAsItStands) {
    const Dictionary request{{"delegates", "anything"}, {"more", 1}};
    validateWith(std::nullopt, request);
    EXPECT_EQ(fake.accountService.lastRequest, request);
}

TEST_F(NimbusTesselDelegateTest, TermsOfServiceVersionsJoinTheDelegatesAndReplaceThoseOfTheSameKey) {
    validateWith(Dictionary{{"a", "accepted"}, {"b", "accepted"}},
                 Dictionary{{"delegates", Dictionary{{"a", 1}, {"c", 1}}}, {"more", 1}});
    EXPECT_EQ(
        fake.accountService.lastRequest,
        (Dictionary{{"delegates", Dictionary{{"a", "accepted"}, {"b", "accepted"}, {"c", 1}}}, {"more", 1}}));
}

TEST_F(NimbusTesselDelegateTest, TermsOfServiceVersionsJoinTheDefaultRequestToo) {
    validateWith(Dictionary{{"a", "accepted"}}, std::nullopt);
    EXPECT_EQ(
        fake.accountService.lastRequest,
        (Dictionary{{"delegates", Dictionary{{"a", "accepted"}, {"com.corvid.skylark", Dictionary{}}}}}));
}

TEST_F(NimbusTesselDelegateTest, TermsOfServiceVersionsMakeTheDelegatesWhereARequestHasNone) {
    validateWith(Dictionary{{"a", 1}}, Dictionary{});
    EXPECT_EQ(fake.accountService.lastRequest, (Dictionary{{"delegates", Dictionary{{"a", 1}}}}));
}

TEST_F(NimbusTesselDelegateTest, TermsOfServiceVersionsReplaceDelegatesThatAreNoDictionary) {
    for (const PropertyList& delegates : {PropertyList("text"), PropertyList(PropertyList::Array{"b"})}) {
        validateWith(Dictionary{{"a", 1}}, Dictionary{{"delegates", delegates}, {"more", 1}});
        EXPECT_EQ(fake.accountService.lastRequest,
                  (Dictionary{{"delegates", Dictionary{{"a", 1}}}, {"more", 1}}));
    }
}

TEST_F(NimbusTesselDelegateTest, ASignInLogsItsRequestAndNeverThePassword) {
    answerWith(true, {{"status", 0}});
    EXPECT_TRUE(signIn({{"x", "added"}}, {"com.corvid.skylark"}));
    EXPECT_EQ(
        lines(),
        (Strings{"<NimbusTesselDelegate>: -[NimbusTesselDelegate "
                 "signInWithUsername:andPassword:additionalDelegates:omittingDelegates:error:] anna - *",
                 "<NimbusTesselDelegate>: 'uber' request: {delegates = {x = added}}",
                 "<NimbusTesselDelegate>: _validateOK: {status = 0}"}));
    EXPECT_EQ(fake.accountService.lastRequest, (Dictionary{{"delegates", Dictionary{{"x", "added"}}}}));
    EXPECT_EQ(fake.recorder.callsTo("AccountManager."), Strings{"AccountManager.authenticate anna, secret"});
}

TEST_F(NimbusTesselDelegateTest, ObserversAreThereBeforeTheRequestIsIssued) {
    std::size_t observersThen = 0;
    fake.accountService.answerAuthenticate = [&](const auto&, const auto&, const auto&) {
        observersThen = observers();
        return std::optional(Answer{});
    };
    validate();
    EXPECT_EQ(observersThen, 2U);
}

TEST_F(NimbusTesselDelegateTest, AValidationObservesBeforeItBuildsItsRequestAndASignInAfterwards) {
    fakes::InProcessPlugin store{"com.corvid.storefront"};
    installPlugin<0>(store);
    std::vector<std::size_t> observersThen;
    store.request = [&](wl_error_slot*) {
        observersThen.push_back(observers());
        return static_cast<wl_value*>(nullptr);
    };
    validateWith(std::nullopt, std::nullopt);
    signIn();
    EXPECT_EQ(observersThen, (std::vector<std::size_t>{2, 0}));
}

TEST_F(NimbusTesselDelegateTest, WhatIsAskedForIsLoggedBeforeItObservesAndAFailureOnceItNoLongerDoes) {
    answerWith(false, {});
    std::vector<std::size_t> observersThen;
    PCLogManager::sharedManager().setObserver([&](const PCLogManager::Call& call) {
        if (call.message.find("_validate") == std::string::npos) { // the notification's own line
            observersThen.push_back(observers());
        }
    });
    EXPECT_FALSE(signIn());
    EXPECT_FALSE(validate());
    PCLogManager::sharedManager().setObserver({});
    EXPECT_EQ(observersThen, std::vector<std::size_t>(5, 0));
}

TEST_F(NimbusTesselDelegateTest, WhatAnAccountErrorMeansIsLoggedBeforeItCounts) {
    for (const int code : {5, 0}) {
        NimbusTesselDelegate fresh;
        answerWith(false, {{kSKPropertyAccountError, code}, {kSKPropertyAccountErrorInfo, "info"}});
        bool countedThen = true;
        PCLogManager::sharedManager().setObserver(
            [&](const PCLogManager::Call&) { countedThen = fresh.needsRepair() || fresh.succeeded(); });
        EXPECT_EQ(fresh.validateNimbusUsernameAndPasswordError("anna", "secret", nullptr), code == 0);
        PCLogManager::sharedManager().setObserver({});
        EXPECT_FALSE(countedThen) << code;
    }
}

TEST_F(NimbusTesselDelegateTest, AValidationIsLoggedBeforeItsRequestIsBuilt) {
    fakes::InProcessPlugin store{"com.corvid.storefront"};
    installPlugin<0>(store);
    store.request = nullptr;
    validateWith(std::nullopt, std::nullopt);
    EXPECT_EQ(
        lines(),
        (Strings{"<NimbusTesselDelegate>: -[NimbusTesselDelegate "
                 "validateNimbusUsername:andPassword:tosVersions:delegates:error:] anna",
                 "Nimbus Plugins: Delegate com.corvid.storefront omits itself from Nimbus setup",
                 "<NimbusTesselDelegate>: _validateOK: {com.corvid.nimbus.property.accountID = anna}"}));
}

TEST_F(NimbusTesselDelegateTest, TheShortValidationAndASignInAreLoggedAfterTheirRequestIsBuilt) {
    fakes::InProcessPlugin chatter{"com.corvid.chatter"};
    installPlugin<0>(chatter);
    chatter.request = nullptr;
    const std::string omits = "Nimbus Plugins: Delegate com.corvid.chatter omits itself from Nimbus setup";
    validate();
    ASSERT_EQ(lines().size(), 3U);
    EXPECT_EQ(lines()[0], omits);
    fake.systemLog.clear();
    signIn();
    ASSERT_EQ(lines().size(), 3U); // the first operation's notification still counts
    EXPECT_EQ(lines()[0], omits);
}

TEST_F(NimbusTesselDelegateTest, BeforeANotificationIsLoggedItIsAskedWhetherItsContentsMayBe) {
    for (const bool completed : {true, false}) {
        NimbusTesselDelegate fresh;
        answerWith(completed, {{"status", 0}});
        fake.recorder.clear();
        EXPECT_EQ(fresh.validateNimbusUsernameAndPasswordError("anna", "secret", nullptr), completed);
        const Strings calls = fake.recorder.calls();
        const auto asked = std::find(calls.begin(), calls.end(), "FileSystem.exists /CorvidInternal");
        ASSERT_NE(asked, calls.end());
        ASSERT_NE(asked + 1, calls.end());
        EXPECT_EQ(*(asked + 1), std::string("SystemLog.write 115, <NimbusTesselDelegate>: ") +
                                    (completed ? "_validateOK" : "_validateNotOK") + ": {status = 0}");
    }
}

} // namespace
} // namespace welcomer
