#include "tools/welcomer/cli/Report.h"

#include <gtest/gtest.h>
#include <sstream>

namespace welcomer::tool {
namespace {

std::string printed(const Report& report, bool isForPrograms = false) {
    std::ostringstream out;
    ReportPrinter(out, -1, isForPrograms).print(report);
    return out.str();
}

TEST(Report, ProgramsGetTheDocumentAndPeopleTheSentence) {
    const Report report({{"user", "anna"}, {"added", true}}, "Added anna.");
    EXPECT_EQ(printed(report), "Added anna.\n");
    EXPECT_EQ(printed(report, true), "{\n  \"user\": \"anna\",\n  \"added\": true\n}\n");
}

TEST(Report, FieldsStandBelowOneAnotherAsPeopleReadThem) {
    Report report;
    report.document = {{"address", "192.0.2.7"}, {"router", nullptr},   {"dns", {"192.0.2.1", "192.0.2.2"}},
                       {"none", Json::array()},  {"isReachable", true}, {"isInternal", false}};
    report.fields({{"Address:", "address"},
                   {"Router:", "router"},
                   {"DNS servers:", "dns"},
                   {"None:", "none"},
                   {"Reachable:", "isReachable"},
                   {"Internal:", "isInternal"}});
    EXPECT_EQ(printed(report), "Address:      192.0.2.7\n"
                               "Router:       -\n"
                               "DNS servers:  192.0.2.1 192.0.2.2\n"
                               "None:         -\n"
                               "Reachable:    yes\n"
                               "Internal:     no\n");
}

TEST(Report, ATableShowsTheRowsOfADocumentInAnOrderOfItsOwn) {
    const Json rows = {{{"name", "anna"}, {"canSignIn", true}}, {{"name", "bert"}, {"canSignIn", nullptr}}};
    Report report;
    report.table(rows, {{"CAN SIGN IN", "canSignIn", "unknown"}, {"NAME", "name"}}, " ");
    EXPECT_EQ(printed(report), " CAN SIGN IN  NAME\n"
                               " yes          anna\n"
                               " unknown      bert\n");
}

TEST(Report, NothingInItCanControlATerminal) {
    Report report({{"name", "a\nb"}}, "a\x1b[2J");
    report.fields({{"Name:", "name"}}).table(Json::array({report.document}), {{"NAME", "name"}});
    EXPECT_EQ(printed(report), "a\\x1b[2J\nName:  a\\nb\nNAME\na\\nb\n");
}

TEST(Report, WhatIsToldOnTheWayIsForPeopleAlone) {
    std::ostringstream people;
    ReportPrinter(people, -1, false).tell(Report().line("Setting up"));
    EXPECT_EQ(people.str(), "Setting up\n");
    std::ostringstream programs;
    ReportPrinter(programs, -1, true).tell(Report().line("Setting up"));
    EXPECT_EQ(programs.str(), "");
}

} // namespace
} // namespace welcomer::tool
