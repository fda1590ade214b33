// Logins as the tool shows them: for programs and for people.

#pragma once

#include "tools/welcomer/cli/Report.h"
#include "tools/welcomer/login/LoginLines.h"
#include "tools/welcomer/login/LoginRecord.h"

#include <chrono>
#include <string>

namespace welcomer::tool {

// A log line behind its time in seconds, such as "     0.250  exiting". Any thread.
std::string timedLine(std::chrono::nanoseconds time, const std::string& message);

// A time since 1970 in ISO 8601 UTC, for programs, and in this machine's own time zone, for people. Any thread.
std::string utcTime(std::chrono::microseconds time);
std::string localTime(std::chrono::microseconds time);

// A line's text for people: who said it stands before it, unless that was the agent itself.
std::string shownMessage(const LogLine& line);

// One log line.
Json toJson(const Login& login, const LogLine& line);

// A login with all its lines.
Json toJson(const Login& login);

// What happened at a login.
//  isRunning  whether its agent still runs
Json toJson(const LoginRecord& record, bool isRunning);

// How an agent ended, for people: "still runs", "ended after 123.4 s".
std::string endText(const LoginRecord& record, bool isRunning);

// A delegate's outcome, for people.
std::string outcomeText(const DelegateOutcome& delegate, bool isRunning);

} // namespace welcomer::tool
