// welcomer log: what the agent and what starts it have logged at the last logins, or draw.

#include "backends/posix/PasswordEntry.h"
#include "platform/Platform.h"
#include "tools/welcomer/cli/Tool.h"
#include "tools/welcomer/commands/Commands.h"
#include "tools/welcomer/login/LogWatch.h"
#include "tools/welcomer/login/LoginLog.h"
#include "tools/welcomer/login/LoginPicture.h"
#include "tools/welcomer/login/LoginReport.h"
#include "tools/welcomer/login/RunningAgent.h"
#include "tools/welcomer/login/Since.h"

#include <algorithm>
#include <cstdint>
#include <iostream>
#include <memory>
#include <span>
#include <system_error>
#include <thread>
#include <unistd.h>
#include <utility>

namespace welcomer::tool {

namespace {

using namespace std::chrono_literals;

constexpr std::size_t kAllSince = 1000; // logins
constexpr auto kTogether = 100ms;       // what comes within it is read at once

struct LogArguments {
    std::uint64_t last = 0; // 0: not given
    std::string since;
    std::string user;
    std::string picture;
    bool follow = false;
};

std::chrono::microseconds now() {
    return std::chrono::duration_cast<std::chrono::microseconds>(
        std::chrono::system_clock::now().time_since_epoch());
}

// The user whose logins are asked for: the caller, or whom root names.
void nameUser(LoginQuery& query, const std::string& name) {
    platform::ProcessIdentity& identity = platform::current().processIdentity;
    query.userID = identity.effectiveUserID();
    query.userName = identity.loginName();
    if (name.empty() || name == query.userName) {
        return;
    }
    if (::geteuid() != 0) {
        throw CommandFailure("--user: only root can ask for another user's log");
    }
    int error = 0;
    const auto user = posix::passwordEntryNamed(name, error);
    if (!user) {
        throw CommandFailure("--user: there is no user " + name +
                             (error == 0 ? "" : ": " + std::generic_category().message(error)));
    }
    query.userID = user->userID;
    query.userName = user->name;
}

LoginQuery queryFor(const Options& options, const LogArguments& arguments) {
    LoginQuery query{.root = options.root};
    nameUser(query, arguments.user);
    if (!arguments.since.empty()) {
        query.since = readSince(arguments.since, now());
        if (!query.since) {
            throw UsageError("--since: " + arguments.since +
                             " is no time, such as \"2026-11-22 11:06\", 11:06, yesterday or 2h");
        }
    }
    query.last = arguments.last > 0 ? arguments.last : query.since ? kAllSince : 1;
    return query;
}

std::string heading(const Login& login) {
    return localTime(beginning(login).wallClock) + (login.hasAgent ? "" : "  (no agent was started)");
}

std::string shownLine(const Login& login, const LogLine& line) {
    return timedLine(sinceBeginning(login, line), shownMessage(line));
}

std::string noLogins(const FoundLogins& found, const LoginQuery& query) {
    return found.note.empty() ? "the log has no login of " + query.userName : found.note;
}

FoundLogins findReadable(const LoginQuery& query) {
    FoundLogins found = findLogins(query);
    if (found.source.empty()) {
        throw CommandFailure(noLogins(found, query));
    }
    return found;
}

Report showLog(const LoginQuery& query) {
    const FoundLogins found = findReadable(query);
    Report report;
    report.document = {{"user", query.userName},
                       {"source", found.source},
                       {"note", found.note.empty() ? Json() : Json(found.note)},
                       {"logins", Json::array()}};
    if (found.logins.empty()) {
        return report.line("No logins: " + noLogins(found, query) + ".");
    }
    for (const Login& login : found.logins) {
        report.document["logins"].push_back(toJson(login));
        report.line(heading(login));
        for (const LogLine& line : login.lines) {
            report.line(shownLine(login, line));
        }
    }
    return report;
}

// Shows lines as they come.
class Follower {
  public:
    explicit Follower(Session& session) : _session(session) {}

    // Shows what has come since the last time.
    //  logins  the last ones
    void show(std::span<const Login> logins) {
        for (const Login& login : logins) {
            const std::chrono::microseconds begin = login.lines.front().wallClock;
            if (begin > _begin) {
                _session.printer.tell(Report().line(heading(login)));
                _begin = begin;
                _count = 0;
            }
            for (; begin == _begin && _count < login.lines.size(); ++_count) {
                _showLine(login, login.lines[_count]);
            }
        }
    }

  private:
    void _showLine(const Login& login, const LogLine& line) {
        _session.printer.tell(Report().line(shownLine(login, line)));
        if (_session.options.json) {
            std::cout << toJson(login, line).dump(-1, ' ', true, Json::error_handler_t::replace) << std::endl;
        }
    }

    Session& _session;
    std::chrono::microseconds _begin{0}; // of the login that is shown
    std::size_t _count = 0;              // its lines so far
};

[[noreturn]] void follow(Session& session, LoginQuery query) {
    Follower follower(session);
    std::size_t wanted = query.last;
    query.last = std::max<std::size_t>(query.last, 2); // one may end while the next one begins
    std::unique_ptr<LogWatch> watch;
    std::string watched;
    for (;;) {
        const FoundLogins found = findReadable(query);
        if (watched != found.source) {
            watched = found.source;
            watch = watchLog(query, watched);
            continue; // what has come before is read once more
        }
        follower.show(std::span(found.logins).last(std::min(wanted, found.logins.size())));
        wanted = query.last;
        watch->wait();
        std::this_thread::sleep_for(kTogether);
    }
}

Report drawLast(const LoginQuery& query, const std::string& path) {
    const FoundLogins found = findLogins(query);
    if (found.logins.empty() || !found.logins.back().hasAgent) {
        throw CommandFailure("there is no login to draw: " + noLogins(found, query));
    }
    const Login& login = found.logins.back();
    const LoginRecord seen = record(login);
    std::optional<std::chrono::nanoseconds> runningFor;
    if (seen.end() == LoginRecord::End::Unfinished && agentRuns(query.root, query.userID)) {
        runningFor = now() - beginning(login).wallClock;
    }
    writePicture(path, drawLogin(seen,
                                 {"Login of " + (seen.account().empty() ? query.userName : seen.account()),
                                  localTime(beginning(login).wallClock)},
                                 runningFor));
    return Report({{"picture", path}}, "Drew the login of " + heading(login) + " in " + path + ".");
}

Report runLog(Session& session, const LogArguments& arguments) {
    const LoginQuery query = queryFor(session.options, arguments);
    if (arguments.follow) {
        follow(session, query);
    }
    return arguments.picture.empty() ? showLog(query) : drawLast(query, arguments.picture);
}

} // namespace

void addLogCommand(CommandLine& commandLine) {
    const auto arguments = std::make_shared<LogArguments>();
    CommandLevel command = commandLine.addCommand(
        "log", "Show what the agent logged at the last login, with the times since its start",
        [arguments](Session& session) { return runLog(session, *arguments); });
    command.option("--last", arguments->last, "Show that many logins, the last ones; 1 unless told otherwise")
        .called("N")
        .within(1, 1000);
    command
        .option("--since", arguments->since,
                "Show the logins since then: \"2026-11-22 11:06\", 11:06, yesterday, or 2h for two hours ago")
        .called("TIME");
    command.option("--user", arguments->user, "Show the logins of another user; only root can")
        .called("NAME");
    const CommandOption following =
        command.flag("--follow", arguments->follow,
                     "Show lines as they come, until Ctrl-C; with --json one object on each line");
    command
        .option("--picture", arguments->picture, "Draw the timeline of the last login in this file, as SVG")
        .called("FILE")
        .excludes(following);
}

} // namespace welcomer::tool
