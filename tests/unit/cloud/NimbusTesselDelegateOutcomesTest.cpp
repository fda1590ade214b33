// Waiting for the answer, and what it means.

#include "cloud/NimbusTesselDelegate.h"
#include "cloud/WLNimbusServiceCatalogue.h"
#include "tests/unit/cloud/NimbusTesselDelegateFixture.h"

#include <algorithm>
#include <chrono>
#include <optional>
#include <string>
#include <vector>

namespace welcomer {
namespace {

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

} // namespace
} // namespace welcomer
