#include "tools/account-server/Metrics.h"

#include <gtest/gtest.h>

namespace welcomer::server {
namespace {

bool hasLine(const std::string& text, const std::string& line) {
    return ("\n" + text).find("\n" + line + "\n") != std::string::npos;
}

TEST(AccountServerMetrics, AnswersAreCountedByResourceAndStatus) {
    Metrics metrics;
    metrics.countAnswer("authenticate", 200);
    metrics.countAnswer("authenticate", 401);
    metrics.countAnswer("authenticate", 200);
    const std::string text = metrics.text();
    EXPECT_TRUE(hasLine(text, "# TYPE welcomer_account_answers_total counter"));
    EXPECT_TRUE(hasLine(text, "welcomer_account_answers_total{resource=\"authenticate\",status=\"200\"} 2"));
    EXPECT_TRUE(hasLine(text, "welcomer_account_answers_total{resource=\"authenticate\",status=\"401\"} 1"));
}

TEST(AccountServerMetrics, ATimeIsInEveryBucketWhoseBoundItDoesNotExceed) {
    Metrics metrics;
    metrics.countQuestion(std::chrono::milliseconds(50));
    metrics.countQuestion(std::chrono::seconds(31));
    const std::string text = metrics.text();
    EXPECT_TRUE(hasLine(text, "# TYPE welcomer_account_question_seconds histogram"));
    EXPECT_TRUE(hasLine(text, "welcomer_account_question_seconds_bucket{le=\"0.02\"} 0"));
    EXPECT_TRUE(hasLine(text, "welcomer_account_question_seconds_bucket{le=\"0.05\"} 1"));
    EXPECT_TRUE(hasLine(text, "welcomer_account_question_seconds_bucket{le=\"30\"} 1"));
    EXPECT_TRUE(hasLine(text, "welcomer_account_question_seconds_bucket{le=\"+Inf\"} 2"));
    EXPECT_TRUE(hasLine(text, "welcomer_account_question_seconds_sum 31.050000"));
    EXPECT_TRUE(hasLine(text, "welcomer_account_question_seconds_count 2"));
}

TEST(AccountServerMetrics, EveryFigureIsExplainedAndEveryLineEnds) {
    Metrics metrics;
    ++metrics.signIns;
    const std::string text = metrics.text();
    EXPECT_TRUE(hasLine(text, "welcomer_account_sign_ins_total 1"));
    EXPECT_TRUE(text.ends_with("\n"));
    for (const char* const name :
         {"answers_total", "question_seconds", "connections", "requests_under_way", "sign_ins_total",
          "unavailable_total", "connections_broken_off_total", "reloads_total"}) {
        EXPECT_NE(text.find(std::string("# HELP welcomer_account_") + name + " "), std::string::npos) << name;
    }
}

} // namespace
} // namespace welcomer::server
