#include "tools/welcomer/login/LoginLines.h"

#include <gtest/gtest.h>

namespace welcomer::tool {
namespace {

using namespace std::chrono_literals;

constexpr char kAgent[] = "wlnimbussetup";

LogLine line(std::chrono::microseconds time, const std::string& program, const std::string& message,
             const std::string& process = "", const std::string& invocation = "", bool isOutput = false) {
    return {time, time, program, message, process, invocation, isOutput};
}

// The messages of each login.
std::vector<std::vector<std::string>> apart(const std::vector<LogLine>& lines) {
    std::vector<std::vector<std::string>> messages;
    for (const Login& login : toldApart(lines)) {
        messages.emplace_back();
        for (const LogLine& each : login.lines) {
            messages.back().push_back(each.message);
        }
    }
    return messages;
}

using Messages = std::vector<std::vector<std::string>>;

TEST(LoginLines, ALoginBeginsWithTheAgentsFirstLine) {
    EXPECT_EQ(apart({line(1s, kAgent, "Self destructing..."), line(2s, kAgent, "exiting"),
                     line(3s, kAgent, "Self destructing..."), line(4s, kAgent, "exiting")}),
              (Messages{{"Self destructing...", "exiting"}, {"Self destructing...", "exiting"}}));
}

TEST(LoginLines, TwoAgentsAtOnceAreToldApartByTheirProcesses) {
    EXPECT_EQ(
        apart({line(1s, kAgent, "Self destructing...", "1"), line(2s, kAgent, "Self destructing...", "2"),
               line(3s, kAgent, "one", "1"), line(4s, kAgent, "two", "2")}),
        (Messages{{"Self destructing...", "one"}, {"Self destructing...", "two"}}));
}

TEST(LoginLines, ALogThatBeginsInTheMiddleHasTheRest) {
    EXPECT_EQ(apart({line(1s, kAgent, "exiting", "1"), line(2s, kAgent, "Self destructing...", "2")}),
              (Messages{{"exiting"}, {"Self destructing..."}}));
}

TEST(LoginLines, WhatTheLauncherSaidJustBeforeBelongsToTheLogin) {
    EXPECT_EQ(apart({line(1s, kLauncherProgram, "Refusing launch agent a"),
                     line(2s, kAgent, "Self destructing...", "1"), line(300s, kLauncherProgram, "Failed")}),
              (Messages{{"Refusing launch agent a", "Self destructing..."}, {"Failed"}}));
}

TEST(LoginLines, WhatTheLauncherSaidAtAnEarlierLoginDoesNot) {
    EXPECT_EQ(apart({line(1s, kLauncherProgram, "Failed"), line(1h, kAgent, "Self destructing...", "1")}),
              (Messages{{"Failed"}, {"Self destructing..."}}));
}

TEST(LoginLines, WhatTheLauncherSaysOfAnAgentThatEndedBelongsToThatLogin) {
    EXPECT_EQ(
        apart({line(1s, kAgent, "Self destructing...", "1"), line(2s, kAgent, "exiting", "1"),
               line(300s, kLauncherProgram, "Launch agent a is offered again at the next login (1 of 3): x"),
               line(301s, kLauncherProgram, "Failed to offer launch agent a again: no")}),
        (Messages{{"Self destructing...", "exiting",
                   "Launch agent a is offered again at the next login (1 of 3): x",
                   "Failed to offer launch agent a again: no"}}));
}

TEST(LoginLines, WhatAProgramOfTheUnitSaysBelongsToItsRun) {
    const std::vector<LogLine> lines{
        line(1s, kAgent, "Self destructing...", "1", "i"), line(2s, kAgent, "Self destructing...", "2", "j"),
        line(3s, "helper", "of the first", "3", "i"), line(4s, kAgent, "exiting", "1", "i", true)};
    EXPECT_EQ(apart(lines),
              (Messages{{"Self destructing...", "of the first", "exiting"}, {"Self destructing..."}}));
    // What a plug-in prints is not taken for the agent's word.
    EXPECT_EQ(record(toldApart(lines)[0]).end(), LoginRecord::End::Unfinished);
}

TEST(LoginLines, TimesCountFromTheAgentsFirstLineOnTheClockThatNobodySets) {
    LogLine first = line(100s, kAgent, "Self destructing...", "1");
    LogLine last = line(50s, kAgent, "exiting", "1"); // the clock was set back meanwhile
    first.steady = 7s;
    last.steady = 9s;
    const Login login = toldApart({line(99s, kLauncherProgram, "Refusing"), first, last})[0];
    EXPECT_EQ(sinceBeginning(login, login.lines[2]), 2s);
    EXPECT_EQ(record(login).last(), 2s);
    EXPECT_EQ(beginning(login).wallClock, 100s);
}

} // namespace
} // namespace welcomer::tool
