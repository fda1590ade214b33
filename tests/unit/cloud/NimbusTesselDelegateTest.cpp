#include "cloud/NimbusTesselDelegate.h"

#include "cloud/WLNimbusServiceCatalogue.h"
#include "log/PCLogManager.h"
#include "tests/fakes/FakePlatform.h"
#include "tests/unit/plugins/InProcessPlugin.h"

#include <algorithm>
#include <chrono>
#include <gtest/gtest.h>
#include <optional>
#include <string>
#include <vector>

namespace welcomer {
namespace {

using namespace platform;
using namespace std::chrono_literals;
using Strings = std::vector<std::string>;
using Dictionary = PropertyList::Dictionary;
using Answer = fakes::FakeAccountService::Answer;
using Wait = fakes::RecordedTime::Wait;

const Dictionary kEmptyRequest{{"delegates", Dictionary{{"com.corvid.skylark", Dictionary{}}}}};

class NimbusTesselDelegateTest : public testing::Test {
  protected:
    NimbusTesselDelegateTest() {
        for (const std::string& identifier : WLNimbusAllSetupServiceIDs()) {
            fake.accountService.servicesOfNewAccounts[identifier] = {};
        }
    }

    // Installs a plug-in that asks for {"from": its identifier}.
    template <int Index>
    void installPlugin(fakes::InProcessPlugin& plugin) {
        const std::string file =
            "/System/Library/CoreServices/FirstRunPlugins/" + *plugin.identifier + ".ncdplugin";
        plugin.request = [&plugin](wl_error_slot*) {
            wl_value* request = plugin.host->new_dictionary();
            plugin.host->dictionary_set(
                request, "from", 4,
                plugin.host->new_string(plugin.identifier->c_str(), plugin.identifier->size()));
            return request;
        };
        fake.fileSystem.addFile(file, "");
        fake.pluginBundle.add(file, "wl_delegate_plugin", plugin.exportAs<Index>());
    }

    void answerWith(bool completed, Dictionary contents, std::chrono::nanoseconds delay = 0ns) {
        _setAnswer({completed, std::move(contents), delay, false});
    }
    void answerImmediately(bool completed, Dictionary contents) {
        _setAnswer({completed, std::move(contents), 0ns, true});
    }
    void answerNever() {
        fake.accountService.answerAuthenticate = [](const auto&, const auto&, const auto&) {
            return std::optional<Answer>();
        };
        fake.accountService.answerSignIn = fake.accountService.answerAuthenticate;
    }

    bool validate() { return delegate.validateNimbusUsernameAndPasswordError("anna", "secret", &error); }
    bool validateWith(const std::optional<Dictionary>& tosVersions,
                      const std::optional<Dictionary>& delegates) {
        return delegate.validateNimbusUsernameAndPasswordTosVersionsDelegatesError(
            "anna", "secret", tosVersions, delegates, &error);
    }
    bool signIn(const Dictionary& additional = {}, const Strings& omitting = {}) {
        return delegate.signInWithUsernameAndPasswordAdditionalDelegatesOmittingDelegatesError(
            "anna", "secret", additional, omitting, &error);
    }
    bool complete(const Strings& selected = WLNimbusAllSetupServiceIDs(), bool kvsOnly = false,
                  const std::shared_ptr<Window>& window = nullptr) {
        return delegate
            .completeSetupWithUsernamePasswordNimbusDictionarySelectedServicesJustTheAccountAndKVSWindowError(
                "anna", "secret", {{"cloud", "dictionary"}}, selected, kvsOnly, window, &error);
    }

    std::size_t slices() const { return fake.virtualTime.waits().size(); }
    Strings lines() const { return fake.systemLog.lines(); }
    bool hasLine(const std::string& line) const {
        const Strings all = lines();
        return std::find(all.begin(), all.end(), line) != all.end();
    }
    std::size_t observers() const {
        std::size_t count = 0;
        for (const char* name : {kSKNotificationAuthenticationCompleted, kSKNotificationAuthenticationFailed,
                                 kSKNotificationSignInCompleted, kSKNotificationSignInFailed}) {
            count += fake.notificationCenter.observerCount(name);
        }
        return count;
    }

    void TearDown() override {
        // On no path is the error written, is an observer left, or does the log get the password.
        EXPECT_EQ(error, (Error{17, "as it was"}));
        EXPECT_EQ(observers(), 0U);
        for (const std::string& line : lines()) {
            EXPECT_EQ(line.find("secret"), std::string::npos) << line;
        }
    }

    fakes::FakePlatform fake;
    const ScopedPlatform installed{fake.platform()};
    NimbusTesselDelegate delegate;
    Error error{17, "as it was"};

  private:
    void _setAnswer(const Answer& answer) {
        fake.accountService.answerAuthenticate = [answer](const auto&, const auto&, const auto&) {
            return std::optional(answer);
        };
        fake.accountService.answerSignIn = fake.accountService.answerAuthenticate;
    }
};

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

TEST_F(NimbusTesselDelegateTest, ANotificationBeforeTheFirstSliceIsNotLostAndNoSliceIsTurned) {
    answerImmediately(true, {{"status", 0}});
    EXPECT_TRUE(signIn());
    EXPECT_EQ(slices(), 0U);
}

TEST_F(NimbusTesselDelegateTest, AnAnswerAtOnceCostsOneSliceAndNoTime) {
    answerWith(true, {{"status", 0}});
    EXPECT_TRUE(signIn());
    EXPECT_EQ(fake.virtualTime.waits(), (std::vector<Wait>{{Wait::Kind::Run, 100ms}}));
    EXPECT_EQ(fake.virtualTime.now(), 0ns);
}

TEST_F(NimbusTesselDelegateTest, ANotificationDuringTheFirstSliceEndsIt) {
    answerWith(true, {{"status", 0}}, 50ms);
    EXPECT_TRUE(signIn());
    EXPECT_EQ(slices(), 1U);
    EXPECT_EQ(fake.virtualTime.now(), 50ms);
}

TEST_F(NimbusTesselDelegateTest, ANotificationLongAfterTheFirstSliceIsWaitedForInSlices) {
    answerWith(true, {{"status", 0}}, 5s + 50ms);
    EXPECT_TRUE(signIn());
    EXPECT_EQ(fake.virtualTime.waits(), (std::vector<Wait>(51, {Wait::Kind::Run, 100ms})));
    EXPECT_EQ(fake.virtualTime.now(), 5s + 50ms);
}

TEST_F(NimbusTesselDelegateTest, ANotificationFromAnotherSenderEndsTheWaitToo) {
    answerNever();
    const auto loop = fake.virtualTime.current();
    fake.virtualTime.global().asyncAfter(1s, [&, loop] {
        loop->perform([&] {
            fake.notificationCenter.post({kSKNotificationAuthenticationCompleted, &fake, {{"status", 0}}});
        });
    });
    EXPECT_TRUE(validate());
    EXPECT_EQ(delegate.delegatesResponseDict(), (Dictionary{{"status", 0}}));
}

TEST_F(NimbusTesselDelegateTest, ANotificationOfAnotherOperationDoesNotEndTheWait) {
    const auto loop = fake.virtualTime.current();
    fake.virtualTime.global().asyncAfter(1s, [&, loop] {
        loop->perform([&] {
            fake.notificationCenter.post({kSKNotificationSignInCompleted, nullptr, {{"status", 0}}});
            fake.notificationCenter.post({kSKNotificationSignInFailed, nullptr, {}});
        });
    });
    answerWith(true, {{"status", 0}, {"answer", "own"}}, 2s);
    EXPECT_TRUE(validate());
    EXPECT_EQ(fake.virtualTime.now(), 2s);
    EXPECT_EQ(delegate.delegatesResponseDict(), (Dictionary{{"status", 0}, {"answer", "own"}}));
}

TEST_F(NimbusTesselDelegateTest, AHourIsWaitedForWithoutATimeOut) {
    answerWith(true, {{"status", 0}}, 1h);
    EXPECT_TRUE(validate());
    EXPECT_EQ(fake.virtualTime.now(), 1h);
}

TEST_F(NimbusTesselDelegateTest, ACompletedValidationWithANonZeroStatusFailsAndKeepsNoResponse) {
    for (const PropertyList& status :
         {PropertyList(2), PropertyList(-1), PropertyList("2"), PropertyList(2.5), PropertyList(true)}) {
        NimbusTesselDelegate fresh;
        answerWith(true, {{"status", status}, {kSKPropertyAccountError, 0}});
        EXPECT_FALSE(fresh.validateNimbusUsernameAndPasswordError("anna", "secret", nullptr));
        EXPECT_FALSE(fresh.succeeded());
        EXPECT_EQ(fresh.delegatesResponseDict(), std::nullopt);
    }
}

TEST_F(NimbusTesselDelegateTest, ACompletedValidationWhoseStatusIsNoNumberIsNoSuccess) {
    for (const PropertyList& status : {PropertyList("fine"), PropertyList(""), PropertyList(Dictionary{}),
                                       PropertyList(PropertyList::Array{0})}) {
        NimbusTesselDelegate fresh;
        answerWith(true, {{"status", status}});
        EXPECT_FALSE(fresh.validateNimbusUsernameAndPasswordError("anna", "secret", nullptr));
        EXPECT_FALSE(fresh.succeeded());
        EXPECT_EQ(fresh.delegatesResponseDict(), std::nullopt);
    }
}

TEST_F(NimbusTesselDelegateTest, AStatusThatIsMissingReadsAsZero) {
    for (const Dictionary& contents :
         {Dictionary{}, Dictionary{{"status", 0.5}}, Dictionary{{"status", false}}}) {
        NimbusTesselDelegate fresh;
        answerWith(true, contents);
        EXPECT_TRUE(fresh.validateNimbusUsernameAndPasswordError("anna", "secret", nullptr));
        EXPECT_EQ(fresh.delegatesResponseDict(), contents);
    }
}

TEST_F(NimbusTesselDelegateTest, AFailureWithoutAnAccountErrorIsLoggedAndKeepsTheResponse) {
    answerWith(false, {{"status", 0}});
    EXPECT_FALSE(validate());
    EXPECT_EQ(delegate.delegatesResponseDict(), (Dictionary{{"status", 0}}));
    EXPECT_TRUE(hasLine("<NimbusTesselDelegate>: _validateNotOK: {status = 0}"));
    EXPECT_EQ(lines().back(), "Nimbus: No accountError for validate failure");
}

TEST_F(NimbusTesselDelegateTest, TermsOfServiceAndRepairWithInfoNeedRepair) {
    for (const int code : {3, 5}) {
        NimbusTesselDelegate fresh;
        const Dictionary contents{{kSKPropertyAccountError, code},
                                  {kSKPropertyAccountErrorInfo, Dictionary{}}};
        answerWith(false, contents);
        EXPECT_FALSE(fresh.validateNimbusUsernameAndPasswordError("anna", "secret", nullptr));
        EXPECT_TRUE(fresh.needsRepair());
        EXPECT_FALSE(fresh.succeeded());
        EXPECT_EQ(fresh.delegatesResponseDict(), contents);
        EXPECT_EQ(lines().back(), "Nimbus: Account needs TOS/Repair");
    }
}

TEST_F(NimbusTesselDelegateTest, TermsOfServiceAndRepairWithoutInfoNeedNone) {
    for (const int code : {3, 5}) {
        NimbusTesselDelegate fresh;
        answerWith(false, {{kSKPropertyAccountError, code}});
        EXPECT_FALSE(fresh.validateNimbusUsernameAndPasswordError("anna", "secret", nullptr));
        EXPECT_FALSE(fresh.needsRepair());
        EXPECT_EQ(lines().back(), "Nimbus: no error info for TOS/Repair response");
    }
}

TEST_F(NimbusTesselDelegateTest, AFailureWithAccountErrorZeroIsASuccess) {
    answerWith(false, {{kSKPropertyAccountError, 0}, {"status", 9}});
    EXPECT_TRUE(signIn());
    EXPECT_TRUE(delegate.succeeded());
    EXPECT_EQ(delegate.delegatesResponseDict(), (Dictionary{{kSKPropertyAccountError, 0}, {"status", 9}}));
    EXPECT_EQ(lines().back(), "Nimbus: validation 'NoError'");
}

TEST_F(NimbusTesselDelegateTest, AnAccountErrorThatIsNoNumberIsAFailureWithALineOfItsOwn) {
    const std::pair<PropertyList, std::string> errors[] = {
        {"wrong", "wrong"}, {Dictionary{{"code", 0}}, "{code = 0}"}, {PropertyList::Array{0}, "(0)"}};
    for (const auto& [code, shown] : errors) {
        NimbusTesselDelegate fresh;
        const Dictionary contents{{kSKPropertyAccountError, code}, {kSKPropertyAccountErrorInfo, "info"}};
        answerWith(false, contents);
        EXPECT_FALSE(fresh.validateNimbusUsernameAndPasswordError("anna", "secret", nullptr));
        EXPECT_FALSE(fresh.succeeded());
        EXPECT_FALSE(fresh.needsRepair());
        EXPECT_EQ(fresh.delegatesResponseDict(), contents);
        EXPECT_EQ(lines().back(), "Nimbus: accountError '" + shown + "' for validate failure is no number");
    }
}

TEST_F(NimbusTesselDelegateTest, AnAccountErrorOfTrueIsOneAndNoSuccess) {
    answerWith(false, {{kSKPropertyAccountError, true}});
    EXPECT_FALSE(signIn());
    EXPECT_EQ(std::ranges::count(lines(), "Nimbus: validation 'NoError'"), 0);
}

TEST_F(NimbusTesselDelegateTest, AnyOtherAccountErrorFailsWithoutALine) {
    for (const int code : {1, 2, 4, 6, -1}) {
        NimbusTesselDelegate fresh;
        fake.systemLog.clear();
        answerWith(false, {{kSKPropertyAccountError, code}, {kSKPropertyAccountErrorInfo, "info"}});
        EXPECT_FALSE(fresh.validateNimbusUsernameAndPasswordError("anna", "secret", nullptr));
        EXPECT_FALSE(fresh.needsRepair());
        EXPECT_EQ(lines().size(), 2U);
    }
}

TEST_F(NimbusTesselDelegateTest, ASecondValidationOnTheSameObjectReturnsWithoutWaiting) {
    answerWith(true, {{"status", 0}}, 1s);
    EXPECT_TRUE(validate());
    const std::size_t before = slices();
    answerWith(false, {{kSKPropertyAccountError, 1}}, 1s);
    EXPECT_TRUE(validate()); // still the first one's outcome
    EXPECT_EQ(slices(), before);
    EXPECT_EQ(fake.recorder.callsTo("AccountManager.authenticate").size(), 2U);
}

TEST_F(NimbusTesselDelegateTest, ASignInAfterAValidationReturnsWithoutWaitingToo) {
    answerWith(true, {{"status", 0}}, 1s);
    EXPECT_TRUE(validate());
    const std::size_t before = slices();
    EXPECT_TRUE(signIn());
    EXPECT_EQ(slices(), before);
}

TEST_F(NimbusTesselDelegateTest, NeedsRepairIsNeverFalseAgain) {
    answerWith(false, {{kSKPropertyAccountError, 5}, {kSKPropertyAccountErrorInfo, "info"}});
    EXPECT_FALSE(validate());
    answerWith(false, {{kSKPropertyAccountError, 1}});
    EXPECT_FALSE(complete());
    EXPECT_FALSE(validate()); // at once, with what has just failed
    EXPECT_TRUE(delegate.needsRepair());
    answerWith(true, {{kSKPropertyAccountID, "anna"}});
    EXPECT_TRUE(complete());
    EXPECT_TRUE(validate()); // at once, with what has just succeeded
    EXPECT_TRUE(delegate.needsRepair());
}

TEST_F(NimbusTesselDelegateTest, AnAccountErrorOfZeroDoesNotEndTheNeedForRepair) {
    answerWith(false, {{kSKPropertyAccountError, 5}, {kSKPropertyAccountErrorInfo, "info"}});
    EXPECT_FALSE(validate());
    answerWith(false, {{kSKPropertyAccountError, 0}});
    EXPECT_FALSE(complete());
    EXPECT_TRUE(validate()); // at once, with the error of 0
    EXPECT_EQ(lines().back(), "Nimbus: validation 'NoError'");
    EXPECT_TRUE(delegate.needsRepair());
}

TEST_F(NimbusTesselDelegateTest, WhatANotificationSaysReplacesWhatTheLastOneSaid) {
    answerWith(false, {{kSKPropertyAccountError, 5}, {kSKPropertyAccountErrorInfo, "info"}});
    EXPECT_FALSE(validate());
    answerWith(false, {{kSKPropertyAccountError, 1}});
    EXPECT_FALSE(complete());
    EXPECT_FALSE(validate()); // at once, with what has just failed
    EXPECT_EQ(delegate.delegatesResponseDict(), (Dictionary{{kSKPropertyAccountError, 1}}));
    answerWith(true, {{kSKPropertyAccountID, "anna"}});
    EXPECT_TRUE(complete());
    EXPECT_TRUE(validate()); // at once, with what has just succeeded
    EXPECT_EQ(delegate.delegatesResponseDict(), (Dictionary{{kSKPropertyAccountID, "anna"}}));
}

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
