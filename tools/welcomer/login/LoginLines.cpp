#include "tools/welcomer/login/LoginLines.h"

#include "handoff/LaunchAgentFile.h"
#include "tools/welcomer/login/AgentTexts.h"

#include <algorithm>
#include <utility>

namespace welcomer::tool {

namespace {

// The launcher starts an agent at once, and waits ten seconds for who runs it.
constexpr std::chrono::minutes kLongestStart{2};

// The agent's own words, which nobody else's output is taken for.
bool isAgents(const LogLine& line) {
    return line.program == kAgentProgramName && !line.isOutput;
}

bool isOfTheSameRun(const Login& login, const LogLine& line) {
    // Where the log names no process, whatever the agent says is of its last run.
    const bool canTell = !line.process.empty() || isAgents(line);
    return canTell && std::ranges::any_of(login.lines, [&](const LogLine& each) {
               return each.program == line.program && each.process == line.process;
           });
}

// Whether the launcher speaks of an agent that has ended.
bool isAfterTheEnd(const LogLine& line) {
    return line.program == kLauncherProgram && (line.message.starts_with(agenttext::kOffered) ||
                                                line.message.starts_with(agenttext::kNotOffered));
}

bool isOfTheSameUnit(const Login& login, const LogLine& line) {
    return !line.invocation.empty() && std::ranges::any_of(login.lines, [&](const LogLine& each) {
        return isAgents(each) && each.invocation == line.invocation;
    });
}

// Whether the launcher alone has spoken so far, just now.
bool isAboutToBegin(const Login& login, const LogLine& line) {
    return !login.hasAgent && line.wallClock - login.lines.back().wallClock < kLongestStart;
}

// Which of the logins so far a line belongs to; none where it begins a new one.
std::vector<Login>::reverse_iterator loginOf(std::vector<Login>& logins, const LogLine& line) {
    const auto begun =
        !logins.empty() && isAboutToBegin(logins.back(), line) ? logins.rbegin() : logins.rend();
    if (isAgents(line) && line.message == agenttext::kBegin) {
        return begun;
    }
    const auto ofRun = std::ranges::find_if(logins.rbegin(), logins.rend(), [&](const Login& login) {
        return isAfterTheEnd(line) ? login.hasAgent
                                   : isOfTheSameRun(login, line) || isOfTheSameUnit(login, line);
    });
    return ofRun != logins.rend() || line.program != kLauncherProgram ? ofRun : begun;
}

} // namespace

std::vector<Login> toldApart(std::vector<LogLine> lines) {
    std::vector<Login> logins;
    for (LogLine& line : lines) {
        const bool ofAgent = isAgents(line);
        const auto found = loginOf(logins, line);
        Login& login = found == logins.rend() ? logins.emplace_back() : *found;
        login.hasAgent = login.hasAgent || ofAgent;
        login.lines.push_back(std::move(line));
    }
    return logins;
}

const LogLine& beginning(const Login& login) {
    const auto found = std::ranges::find_if(login.lines, isAgents);
    return found == login.lines.end() ? login.lines.front() : *found;
}

std::chrono::nanoseconds sinceBeginning(const Login& login, const LogLine& line) {
    return line.steady - beginning(login).steady;
}

LoginRecord record(const Login& login) {
    LoginRecord record;
    for (const LogLine& line : login.lines) {
        if (isAgents(line)) {
            record.read(sinceBeginning(login, line), line.message);
        }
    }
    return record;
}

} // namespace welcomer::tool
