#include "backends/accountserver/Messages.h"

#include "propertylist/PropertyListReader.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace welcomer::accountserver {
namespace {

constexpr ContentType kBoth[] = {ContentType::JSON, ContentType::PropertyList};

const Sender kSender{"0b6f-1", "anna", {"Debian GNU/Linux", "12", "de_AT.UTF-8"}};

AuthenticateRequest request() {
    return {kSender,
            {{"delegates",
              PropertyList::Dictionary{{"com.corvid.skylark", PropertyList::Dictionary{}},
                                       {"org.example.notes", PropertyList::Dictionary{{"n", 1.0}}}}}}};
}

AuthenticateAnswer answer() {
    return {2, "anna",
            PropertyList::Dictionary{{"com.corvid.chatter", PropertyList::Dictionary{{"status", 0}}}},
            "anna@example.org",
            std::map<std::string, AccountServiceEntry>{{"contacts", {true, {}}},
                                                       {"mail", {false, {{"p", PropertyList::Array{1}}}}}}};
}

// The error of a request that lacks what was replaced by nothing, or has it otherwise.
std::string errorWithout(const std::string& member, const std::string& replacement) {
    std::string text = encode(request(), "secret", ContentType::JSON).value();
    const std::size_t at = text.find(member);
    EXPECT_NE(at, std::string::npos) << member << " in " << text;
    text.replace(at, member.size(), replacement);
    return decodeAuthenticateRequest(text, ContentType::JSON).error;
}

TEST(MessagesTest, ARequestReadsBackInBothForms) {
    for (const ContentType type : kBoth) {
        const auto body = encode(request(), "p\"<&>\\\r\xC3\xA9", type);
        ASSERT_TRUE(body);
        const auto read = decodeAuthenticateRequest(*body, type);
        ASSERT_TRUE(read) << read.error;
        EXPECT_EQ(read.message->request, request());
        EXPECT_EQ(read.message->password, "p\"<&>\\\r\xC3\xA9");
    }
}

TEST(MessagesTest, AnAcceptanceReadsBackInBothForms) {
    for (const ContentType type : kBoth) {
        for (const PropertyList& terms :
             {PropertyList("v2"), PropertyList(PropertyList::Dictionary{{"v", 2}})}) {
            const AcceptTermsRequest acceptance{kSender, terms};
            const auto read = decodeAcceptTermsRequest(encode(acceptance, "", type).value(), type);
            ASSERT_TRUE(read) << read.error;
            EXPECT_EQ(read.message->request, acceptance);
            EXPECT_EQ(read.message->password, "");
        }
    }
}

TEST(MessagesTest, APasswordWithControlCharactersIsSentAsJSONAlone) {
    EXPECT_EQ(
        decodeAuthenticateRequest(encode(request(), "a\x01", ContentType::JSON).value(), ContentType::JSON)
            .message->password,
        "a\x01");
    std::string error;
    EXPECT_EQ(encode(request(), "a\x01", ContentType::PropertyList, &error), std::nullopt);
    EXPECT_EQ(error, "the password holds a character for which XML has no place");
    EXPECT_STREQ(whyNotSendable("a\xFF", ContentType::JSON), "the password holds invalid UTF-8");
    EXPECT_STREQ(whyNotSendable(std::string(kMaximumPasswordSize + 1, 'a'), ContentType::JSON),
                 "the password is too long");
}

TEST(MessagesTest, DataAndDatesAreSentAsAPropertyListAlone) {
    AuthenticateRequest withData = request();
    withData.delegatesRequest["delegates"] =
        PropertyList::Dictionary{{"d", PropertyList::Data{"\x00\xFF"}}, {"t", PropertyList::Date{86400}}};
    std::string error;
    EXPECT_EQ(encode(withData, "secret", ContentType::JSON, &error), std::nullopt);
    EXPECT_EQ(error, "delegatesRequest/delegates/d is data, for which JSON has no place");
    const auto body = encode(withData, "secret", ContentType::PropertyList);
    EXPECT_EQ(decodeAuthenticateRequest(body.value(), ContentType::PropertyList).message->request, withData);
}

TEST(MessagesTest, AMemberOfARequestThatIsMissingOrWrongIsNamed) {
    EXPECT_EQ(errorWithout("\"requestID\":\"0b6f-1\",", ""), "the member requestID is missing");
    EXPECT_EQ(errorWithout("0b6f-1", "0b6f/1"),
              "the member requestID holds something else than letters, digits and hyphens");
    EXPECT_EQ(errorWithout("0b6f-1", std::string(65, 'a')), "the member requestID is too long");
    EXPECT_EQ(errorWithout("\"password\":\"secret\",", ""), "the member password is missing");
    EXPECT_EQ(errorWithout("\"secret\"", "7"), "the member password is no text");
    EXPECT_EQ(errorWithout("\"anna\"", "\"\""), "the member user is empty");
    EXPECT_EQ(errorWithout("\"anna\"", "null"), "the member user is missing");
    EXPECT_EQ(errorWithout("\"version\":\"12\"", "\"other\":1"), "the member machine/version is missing");
    EXPECT_EQ(errorWithout("\"12\"", "12"), "the member machine/version is no text");
    EXPECT_EQ(errorWithout("\"delegatesRequest\"", "\"delegates\""),
              "the member delegatesRequest is missing");
    EXPECT_EQ(decodeAuthenticateRequest("[]", ContentType::JSON).error, "the body is no object");
    EXPECT_EQ(
        decodeAcceptTermsRequest(encode(request(), "secret", ContentType::JSON).value(), ContentType::JSON)
            .error,
        "the member terms is missing");
}

TEST(MessagesTest, MembersThatAreNotKnownArePassedOver) {
    EXPECT_EQ(errorWithout("\"user\"", "\"more\":[{\"a\":1}],\"user\""), "");
    const auto read = decodeAuthenticateAnswer(
        R"({"status": 0, "accountID": "anna", "x": [1], "services": {"s": {"y": 2}}})", ContentType::JSON);
    ASSERT_TRUE(read) << read.error;
    EXPECT_EQ(read.message->services,
              (std::map<std::string, AccountServiceEntry>{{"s", AccountServiceEntry{true, {}}}}));
}

TEST(MessagesTest, AnAnswerReadsBackInBothForms) {
    for (const ContentType type : kBoth) {
        for (const AuthenticateAnswer& each : {answer(), AuthenticateAnswer{0, "anna"}}) {
            const auto read = decodeAuthenticateAnswer(encode(each, type).value(), type);
            ASSERT_TRUE(read) << read.error;
            EXPECT_EQ(*read.message, each);
        }
    }
}

TEST(MessagesTest, AMemberOfAnAnswerThatIsMissingOrWrongIsNamed) {
    const auto errorOf = [](const char* body) {
        return decodeAuthenticateAnswer(body, ContentType::JSON).error;
    };
    EXPECT_EQ(errorOf(R"({"accountID": "anna"})"), "the member status is missing");
    EXPECT_EQ(errorOf(R"({"status": "0", "accountID": "anna"})"), "the member status is no integer");
    EXPECT_EQ(errorOf(R"({"status": 0.0, "accountID": "anna"})"), "the member status is no integer");
    EXPECT_EQ(errorOf(R"({"status": false, "accountID": "anna"})"), "the member status is no integer");
    EXPECT_EQ(errorOf(R"({"status": 18446744073709551615, "accountID": "a"})"),
              "the member status is no integer");
    EXPECT_EQ(errorOf(R"({"status": 0})"), "the member accountID is missing");
    EXPECT_EQ(errorOf(R"({"status": 0, "accountID": "a", "delegates": []})"),
              "the member delegates is no object");
    EXPECT_EQ(errorOf(R"({"status": 0, "accountID": "a", "mailAddress": 1})"),
              "the member mailAddress is no text");
    EXPECT_EQ(errorOf(R"({"status": 0, "accountID": "a", "services": {"s": 1}})"),
              "the member services/s is no object");
    EXPECT_EQ(errorOf(R"({"status": 0, "accountID": "a", "services": {"s": {"canBeEnabled": 1}}})"),
              "the member services/s/canBeEnabled is no boolean");
}

TEST(MessagesTest, AnAnswerThatIsCutOffAnywhereIsNone) {
    for (const ContentType type : kBoth) {
        const std::string whole = encode(answer(), type).value();
        // The line end behind a property list may be missing.
        const std::size_t end = whole.find_last_not_of('\n') + 1;
        for (std::size_t size = 0; size < end; ++size) {
            const auto read = decodeAuthenticateAnswer(whole.substr(0, size), type);
            EXPECT_FALSE(read) << size;
            EXPECT_NE(read.error, "") << size;
        }
    }
}

TEST(MessagesTest, KeysThatAppearTwiceAreRefusedInBothForms) {
    EXPECT_EQ(
        decodeAuthenticateAnswer(R"({"status": 1, "accountID": "a", "status": 0})", ContentType::JSON).error,
        "status appears twice");
    EXPECT_EQ(decodeAuthenticateAnswer("<plist><dict><key>status</key><integer>1</integer>\n"
                                       "<key>status</key><integer>0</integer></dict></plist>",
                                       ContentType::PropertyList)
                  .error,
              "line 2, column 1: the key \"status\" appears twice");
}

TEST(MessagesTest, ABodyThatIsTooLongIsNeitherWrittenNorRead) {
    AuthenticateAnswer large = answer();
    large.mailAddress = std::string(kMaximumBodySize, 'a');
    std::string error;
    EXPECT_EQ(encode(large, ContentType::JSON, &error), std::nullopt);
    EXPECT_EQ(error, "the body would be longer than 16777216 bytes");
    EXPECT_EQ(decodeAuthenticateAnswer(std::string(kMaximumBodySize + 1, ' '), ContentType::JSON).error,
              "the body is longer than 16777216 bytes");
}

TEST(MessagesTest, AProblemReadsBackInBothForms) {
    for (const ContentType type : kBoth) {
        for (const ProblemKind& kind : kProblemKinds) {
            for (const Problem& each :
                 {Problem{kind.type}, Problem{kind.type, "Why.", "0b6f-1", PropertyList(7)}}) {
                const auto read = decodeProblem(encode(each, type).value(), type, kind.httpStatus);
                ASSERT_TRUE(read) << read.error;
                EXPECT_EQ(*read.message, each);
            }
        }
    }
}

TEST(MessagesTest, AProblemOfAnUnknownTypeOrWithAnotherHTTPStatusIsNone) {
    EXPECT_EQ(decodeProblem(R"({"type": "about:blank"})", ContentType::JSON, 401).error,
              "the problem is of no type that is known");
    EXPECT_EQ(decodeProblem(R"({"title": "x"})", ContentType::JSON, 401).error, "the member type is missing");
    EXPECT_EQ(decodeProblem(R"({"type": "urn:welcomer:problem:unavailable"})", ContentType::JSON, 401).error,
              "urn:welcomer:problem:unavailable comes with the HTTP status 401");
}

TEST(MessagesTest, ADescriptionReadsBackInBothForms) {
    for (const ContentType type : kBoth) {
        const ServerDescription description{"a server", "1.2"};
        EXPECT_EQ(decodeServerDescription(encode(description, type).value(), type).message, description);
    }
}

TEST(MessagesTest, AContentTypeCountsWithoutCaseAndParameters) {
    EXPECT_EQ(contentTypeNamed("application/json"), ContentType::JSON);
    EXPECT_EQ(contentTypeNamed(" Application/JSON ; charset=utf-8"), ContentType::JSON);
    EXPECT_EQ(contentTypeNamed("application/problem+json"), ContentType::JSON);
    EXPECT_EQ(contentTypeNamed("application/x-plist"), ContentType::PropertyList);
    for (const char* other : {"", " ", ";", "text/html", "application/jsonx", "application/xml"}) {
        EXPECT_EQ(contentTypeNamed(other), std::nullopt) << other;
    }
}

} // namespace
} // namespace welcomer::accountserver
