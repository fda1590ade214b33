// The log lines of logins, told apart.

#pragma once

#include "tools/welcomer/login/LoginRecord.h"

#include <chrono>
#include <string>
#include <vector>

namespace welcomer::tool {

inline constexpr char kLauncherProgram[] = "welcomer-launch-agents";

// One line of the system log.
struct LogLine {
    std::chrono::microseconds wallClock{0}; // since 1970
    std::chrono::microseconds steady{0}; // on a clock that nobody sets, where the log has one; else as above
    std::string program = {};
    std::string message = {};
    std::string process = {};    // which run of the program it is of; empty where the log does not say
    std::string invocation = {}; // which run of a unit; empty likewise
    bool isOutput = false;       // what a program printed, not what it logged
};

// What the log has of one login.
struct Login {
    // Never empty; the agent's first one is its beginning, as far as the log has it.
    std::vector<LogLine> lines = {};
    bool hasAgent = false; // whether the agent itself logged anything
};

// Tells logins apart: each begins with the agent's first line, or with what its launcher logged before it.
//  lines  of one user's agent, its unit and its launcher, in the order of their times
std::vector<Login> toldApart(std::vector<LogLine> lines);

// When a login began: the time of the agent's first line, or of the first of all where it has none.
const LogLine& beginning(const Login& login);

// How long after the login's beginning a line came.
std::chrono::nanoseconds sinceBeginning(const Login& login, const LogLine& line);

// What the agent's own lines say.
LoginRecord record(const Login& login);

} // namespace welcomer::tool
