#include "tools/account-server/AnswerWriter.h"

#include <gtest/gtest.h>

namespace welcomer::server {
namespace {

using accountserver::AuthenticateAnswer;
using accountserver::ContentType;
using accountserver::Problem;
using accountserver::ProblemType;

AuthenticateAnswer withData() {
    AuthenticateAnswer answer{0, "anna", {}, {}, {}};
    answer.delegates = PropertyList::Dictionary{{"x", PropertyList::Data{"bytes"}}};
    return answer;
}

TEST(AcceptedForms, NothingSaidTakesEverything) {
    EXPECT_TRUE(AcceptedForms("").json);
    EXPECT_TRUE(AcceptedForms(" ").propertyList);
    EXPECT_TRUE(AcceptedForms("text/html, */*;q=0.1").json);
    EXPECT_TRUE(AcceptedForms("text/html").isEmpty());
}

TEST(AcceptedForms, AQualityOfZeroIsARefusalThatHoldsOverWhatNamesMany) {
    EXPECT_FALSE(AcceptedForms("application/json;q=0, */*").json);
    EXPECT_TRUE(AcceptedForms("application/json;q=0, */*").propertyList);
    EXPECT_FALSE(AcceptedForms("*/*, application/x-plist; q=0.000").propertyList);
    EXPECT_TRUE(AcceptedForms("application/json;q=0.5").json);
    EXPECT_TRUE(AcceptedForms("APPLICATION/JSON").json);
}

TEST(AnswerWriter, AnAnswerHasTheRequestsFormWhereThatIsAccepted) {
    const AuthenticateAnswer answer{0, "anna", {}, {}, {}};
    const AcceptedForms both("application/json, application/x-plist");
    EXPECT_EQ(writeAnswer(answer, "1", both, ContentType::JSON).contentType, "application/json");
    EXPECT_EQ(writeAnswer(answer, "1", both, ContentType::PropertyList).contentType, "application/x-plist");
    EXPECT_EQ(writeAnswer(answer, "1", AcceptedForms("application/x-plist"), ContentType::JSON).contentType,
              "application/x-plist");
}

TEST(AnswerWriter, WhatJSONHasNoPlaceForComesAsAPropertyListOrNotAtAll) {
    const AcceptedForms both("*/*");
    EXPECT_EQ(writeAnswer(withData(), "1", both, ContentType::JSON).contentType, "application/x-plist");
    const Answer refused = writeAnswer(withData(), "1", AcceptedForms("application/json"), ContentType::JSON);
    EXPECT_EQ(refused.status, 406U);
    EXPECT_EQ(refused.contentType, "application/problem+json");
}

TEST(AnswerWriter, AProblemIsJSONUnlessItHoldsMoreOrTheClientTakesNone) {
    const Problem plain{ProblemType::Repair, {}, "1", {"text"}};
    const Problem withInfo{ProblemType::Repair, {}, "1", {PropertyList::Data{"x"}}};
    EXPECT_EQ(writeProblem(plain, AcceptedForms("")).contentType, "application/problem+json");
    EXPECT_EQ(writeProblem(plain, AcceptedForms("text/html")).contentType, "application/problem+json");
    EXPECT_EQ(writeProblem(plain, AcceptedForms("application/x-plist")).contentType, "application/x-plist");
    EXPECT_EQ(writeProblem(withInfo, AcceptedForms("")).contentType, "application/x-plist");
    EXPECT_EQ(writeProblem(withInfo, AcceptedForms("")).status, 403U);
    EXPECT_EQ(writeProblem(withInfo, AcceptedForms("application/json")).status, 406U);
}

} // namespace
} // namespace welcomer::server
