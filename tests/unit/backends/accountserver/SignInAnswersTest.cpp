// What an answer is for the account service, as the document's table has it.

#include "backends/accountserver/SignInAnswers.h"

#include "platform/AccountService.h"

#include <gtest/gtest.h>

#include <fstream>
#include <map>
#include <sstream>
#include <string>
#include <vector>

namespace welcomer::accountserver {
namespace {

using namespace platform;

const PropertyList kInfo = PropertyList::Dictionary{{"version", "2026-10"}};

struct Row {
    std::string httpStatus;
    std::string type;
    std::string accountError;
    std::string notification;
    std::string info;
};

std::string withoutMarks(std::string cell) {
    std::erase(cell, '`');
    const std::size_t first = cell.find_first_not_of(' ');
    return first == std::string::npos ? "" : cell.substr(first, cell.find_last_not_of(' ') - first + 1);
}

// The rows of the table whose first column is an HTTP status.
std::vector<Row> documentedRows() {
    std::ifstream document(WELCOMER_ACCOUNT_SERVER_DOCUMENT);
    std::vector<Row> rows;
    for (std::string line; std::getline(document, line);) {
        std::istringstream cells(line);
        std::vector<std::string> row;
        for (std::string cell; std::getline(cells, cell, '|');) {
            row.push_back(withoutMarks(cell));
        }
        if (row.size() == 6 && row[1].size() == 3 &&
            row[1].find_first_not_of("0123456789") == std::string::npos) {
            rows.push_back({row[1], row[2], row[3], row[4], row[5]});
        }
    }
    return rows;
}

PropertyList::Dictionary expectedContents(const Row& row) {
    PropertyList::Dictionary contents{{kSKPropertyAccountError, std::stoi(row.accountError)}};
    if (row.info == "errorInfo") {
        contents[kSKPropertyAccountErrorInfo] = kInfo;
    } else if (row.info == "text") {
        contents[kSKPropertyAccountErrorInfo] = "Why.";
    } else {
        EXPECT_EQ(row.info, "");
    }
    return contents;
}

TEST(SignInAnswersTest, EveryRowOfTheDocumentedTableIsWhatTheCodeDoes) {
    std::map<std::string, Row> failures;
    for (const Row& row : documentedRows()) {
        if (row.type.empty()) {
            EXPECT_EQ(row.httpStatus, "200");
            EXPECT_EQ(row.notification, "completed");
            EXPECT_TRUE(signInAnswerOf(AuthenticateAnswer{}).isCompleted);
            continue;
        }
        EXPECT_TRUE(failures.emplace(row.type, row).second) << row.type << " stands there twice";
    }
    ASSERT_EQ(failures.size(), kProblemKinds.size());
    for (const auto& [type, row] : failures) {
        const ProblemKind* const kind = kindWithURI(type);
        ASSERT_NE(kind, nullptr) << type;
        EXPECT_EQ(kind->httpStatus, std::stoi(row.httpStatus)) << type;
        EXPECT_EQ(row.notification, "failed") << type;
        const SignInAnswer answer = signInAnswerOf(Problem{kind->type, "Why.", "", kInfo});
        EXPECT_FALSE(answer.isCompleted) << type;
        EXPECT_EQ(answer.contents, expectedContents(row)) << type;
    }
}

TEST(SignInAnswersTest, ACompletedAnswerHasWhatTheNotificationCarries) {
    const PropertyList::Dictionary delegates{{"com.corvid.chatter", PropertyList::Dictionary{{"status", 0}}}};
    EXPECT_EQ(signInAnswerOf({2, "anna", delegates}).contents,
              (PropertyList::Dictionary{
                  {kStatusKey, 2}, {kSKPropertyAccountID, "anna"}, {kDelegatesKey, delegates}}));
    EXPECT_EQ(signInAnswerOf({0, "anna"}).contents,
              (PropertyList::Dictionary{{kStatusKey, 0}, {kSKPropertyAccountID, "anna"}}));
}

TEST(SignInAnswersTest, AProblemWithoutDetailSaysItsTitleAndTooManyTriesSayWhenToTryAgain) {
    const auto infoOf = [](const Problem& problem, std::optional<std::int64_t> retryAfter = std::nullopt) {
        return signInAnswerOf(problem, retryAfter).contents.at(kSKPropertyAccountErrorInfo);
    };
    EXPECT_EQ(infoOf({ProblemType::Unavailable}),
              PropertyList("The server's directory of users does not answer"));
    EXPECT_EQ(infoOf({ProblemType::TooManyTries}, 42),
              PropertyList("There were too many tries; try again in 42 s"));
    EXPECT_EQ(infoOf({ProblemType::TooManyTries}), PropertyList("There were too many tries"));
}

TEST(SignInAnswersTest, TermsAndRepairWithoutInfoHaveNone) {
    for (const ProblemType type :
         {ProblemType::TermsOfService, ProblemType::Repair, ProblemType::OtherTerms}) {
        EXPECT_EQ(signInAnswerOf(Problem{type, "Why."}).contents.size(), 1U);
    }
}

TEST(SignInAnswersTest, AnAccountHasTheServicesOfTheAnswerOrAllOfThem) {
    EXPECT_EQ(servicesOf({0, "anna"}).size(), std::size(kSKServiceIDs));
    AuthenticateAnswer answer{0, "anna"};
    answer.mailAddress = "anna@example.org";
    answer.services = {{kSKServiceIDMail, {false, {}}}, {kSKServiceIDContacts, {true, {{"p", 1}}}}};
    EXPECT_EQ(servicesOf(answer),
              (PropertyList::Dictionary{
                  {kSKServiceIDContacts,
                   PropertyList::Dictionary{{"CanBeEnabled", true},
                                            {"Properties", PropertyList::Dictionary{{"p", 1}}}}},
                  {kSKServiceIDMail, PropertyList::Dictionary{
                                         {"CanBeEnabled", false},
                                         {"Properties", PropertyList::Dictionary{{kSKPropertyMailEmailAddress,
                                                                                  "anna@example.org"}}}}}}));
    answer.services = {{kSKServiceIDMail, {true, {{kSKPropertyMailEmailAddress, "own@example.org"}}}}};
    EXPECT_EQ(*servicesOf(answer).at(kSKServiceIDMail).find("Properties")->find(kSKPropertyMailEmailAddress),
              PropertyList("own@example.org"));
}

} // namespace
} // namespace welcomer::accountserver
