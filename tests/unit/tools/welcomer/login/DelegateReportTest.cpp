#include "tools/welcomer/login/DelegateReport.h"

#include <gtest/gtest.h>

namespace welcomer::tool {
namespace {

// The report as "identifier|outcome|seconds" per delegate.
std::vector<std::string> report(std::initializer_list<const char*> lines) {
    DelegateReport report;
    for (const char* line : lines) {
        report.read({}, line);
    }
    std::vector<std::string> rows;
    for (const DelegateOutcome& delegate : report.delegates()) {
        rows.push_back(delegate.identifier + "|" + delegate.text() + "|" + delegate.seconds);
    }
    return rows;
}

using Rows = std::vector<std::string>;

TEST(DelegateReport, ADelegateIsAtWorkUntilItsOutcomeIsLogged) {
    EXPECT_EQ(report({"Vidlink: 2 aliases", "setting up a.b"}), Rows{"a.b|working|"});
}

TEST(DelegateReport, ProgressIsToldUntilThereIsAnOutcome) {
    EXPECT_EQ(report({"setting up a.b", "a.b progress: 0 %", "a.b progress: 40 % copying: 1 of 3"}),
              Rows{"a.b|working, 40 % copying: 1 of 3|"});
    EXPECT_EQ(report({"setting up a.b", "setting up c.d", "a.b progress: 40 %",
                      "a.b setup: completed (1.250 seconds)", "a.b progress: 41 %"}),
              (Rows{"a.b|completed|1.250", "c.d|working|"}));
}

TEST(DelegateReport, BothFormsOfCompletionAreRead) {
    EXPECT_EQ(report({"setting up a.b", "setting up c.d", "c.d setup: completed (1.250 seconds)",
                      "a.b setup+chosen: completed (0.003 seconds)"}),
              (Rows{"a.b|completed|0.003", "c.d|completed|1.250"}));
}

TEST(DelegateReport, AnErrorThatLooksLikeTheSecondsIsKeptWhole) {
    EXPECT_EQ(report({"setting up a.b", "a.b setup: gave up (5.000 seconds) twice (9.500 seconds)"}),
              Rows{"a.b|gave up (5.000 seconds) twice|9.500"});
}

TEST(DelegateReport, SecondsThatAreNoNumberAreNoOutcome) {
    for (const std::string& seconds : std::vector<std::string>{"many", "", "-1", "1.2.3", "inf", "0x1", "1e3",
                                                               "1 2", std::string(400, '9')}) {
        const std::string answer = "a.b setup: completed (" + seconds + " seconds)";
        const std::string exception =
            "exception in setup response for plugin a.b (" + seconds + " seconds): boom: it broke";
        EXPECT_EQ(report({"setting up a.b", answer.c_str(), exception.c_str()}), Rows{"a.b|working|"})
            << seconds;
    }
}

TEST(DelegateReport, AnExceptionIsAnOutcome) {
    EXPECT_EQ(report({"setting up a.b",
                      "exception in setup response for plugin a.b (0.100 seconds): boom: it broke"}),
              Rows{"a.b|exception: boom: it broke|0.100"});
}

TEST(DelegateReport, AnExceptionAfterTheHandlerHasRunChangesNothing) {
    EXPECT_EQ(report({"setting up a.b", "a.b setup: completed (0.100 seconds)",
                      "exception in setup response for plugin a.b (0.200 seconds): late"}),
              Rows{"a.b|completed|0.100"});
}

TEST(DelegateReport, ADelegateWithoutAResponseHasNoSeconds) {
    EXPECT_EQ(report({"no cached response for a.b"}), Rows{"a.b|no cached response|"});
}

TEST(DelegateReport, AnIdentifierThatBeginsLikeAnotherIsToldApart) {
    EXPECT_EQ(report({"setting up a", "setting up a setup", "a setup setup: completed (2.000 seconds)"}),
              (Rows{"a|working|", "a setup|completed|2.000"}));
}

TEST(DelegateReport, LinesThatOnlyResembleAnOutcomeChangeNothing) {
    EXPECT_EQ(report({"setting up a.b", "a.b setup: no seconds", "x a.b setup: completed (1.000 seconds)",
                      "exception in setup response for plugin a.b (", "setting off a.b"}),
              Rows{"a.b|working|"});
}

TEST(DelegateReport, DelegatesAtWorkAreCounted) {
    DelegateReport report;
    EXPECT_EQ(report.working(), 0U);
    report.read({}, "setting up a.b");
    report.read({}, "setting up c.d");
    report.read({}, "no cached response for e.f");
    EXPECT_EQ(report.working(), 2U);
    report.read({}, "c.d setup: completed (1.000 seconds)");
    EXPECT_EQ(report.working(), 1U);
}

} // namespace
} // namespace welcomer::tool
