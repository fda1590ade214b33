// welcomer status: what waits for the next login, what the last one did, and what is to be done.

#include "platform/CredentialStore.h"
#include "platform/Platform.h"
#include "tools/welcomer/cli/AsUser.h"
#include "tools/welcomer/cli/Tool.h"
#include "tools/welcomer/commands/Commands.h"
#include "tools/welcomer/login/Advice.h"
#include "tools/welcomer/login/LastLogin.h"
#include "tools/welcomer/login/LoginReport.h"
#include "tools/welcomer/story/ServiceStates.h"

#include <memory>
#include <optional>
#include <utility>

namespace welcomer::tool {

namespace {

// What is known of the item.
std::string itemText(const WaitingSetup& waiting) {
    if (waiting.hasItem()) {
        return (waiting.account.empty() ? "waits" : "waits, for " + waiting.account) +
               (waiting.store.empty() ? "" : ", in the " + waiting.store);
    }
    return waiting.itemStatus == platform::kCredentialItemNotFound
               ? "none"
               : platform::credentialStatusText(waiting.itemStatus);
}

std::string agentText(const WaitingSetup& waiting) {
    if (!waiting.hasAgent) {
        return "not installed";
    }
    return "installed, " + waiting.agentPath +
           (waiting.agentProblem.empty() ? "" : " (" + waiting.agentProblem + ")");
}

std::string fitText(const WaitingSetup& waiting) {
    if (!waiting.hasItem() && waiting.itemStatus != platform::kCredentialItemNotFound) {
        return "unknown";
    }
    return !waiting.fits()     ? "no"
           : waiting.hasItem() ? "yes, the next login finishes the setup"
                               : "yes, nothing waits";
}

Json toJson(const WaitingSetup& waiting) {
    const bool isKnown = waiting.hasItem() || waiting.itemStatus == platform::kCredentialItemNotFound;
    return {{"item", isKnown ? Json(waiting.hasItem()) : Json()},
            {"itemStatus", waiting.itemStatus},
            {"account", waiting.account.empty() ? Json() : Json(waiting.account)},
            {"store", waiting.store.empty() ? Json() : Json(waiting.store)},
            {"agent", waiting.hasAgent},
            {"agentFile", waiting.agentPath},
            {"agentProblem", waiting.agentProblem.empty() ? Json() : Json(waiting.agentProblem)},
            {"fit", isKnown ? Json(waiting.fits()) : Json()}};
}

void addRecord(Report& report, const LoginRecord& record, bool isRunning) {
    TextTable delegates({"DELEGATE", "OUTCOME", "SECONDS"}, "  ");
    for (const DelegateOutcome& each : record.delegates()) {
        delegates.addRow(
            {each.identifier, outcomeText(each, isRunning), each.seconds.empty() ? "-" : each.seconds});
    }
    TextTable services({"SERVICE", "OUTCOME"}, "  ");
    for (const ServiceOutcome& each : record.services()) {
        services.addRow({serviceName(each.identifier), each.text()});
    }
    if (!record.delegates().empty()) {
        report.table(std::move(delegates));
    }
    if (!record.services().empty()) {
        report.table(std::move(services));
    }
}

void addLastLogin(Report& report, const LastLogin& last) {
    if (!last.login) {
        report.line("Last login:  " + (last.note.empty() ? "the log has none" : "unknown, " + last.note));
        return;
    }
    const std::string when = localTime(beginning(*last.login).wallClock);
    if (!last.login->hasAgent) {
        report.line("Last login:  " + when + ", no agent was started");
        return;
    }
    const LoginRecord seen = record(*last.login);
    report.line("Last login:  " + when + (seen.account().empty() ? "" : ", for " + seen.account()) +
                ", the agent " + endText(seen, last.isRunning));
    if (!last.note.empty()) {
        report.line("             " + last.note);
    }
    addRecord(report, seen, last.isRunning);
}

//  user  whom root asks for, or empty
Report showStatus(const LastLogin& last, const std::string& user) {
    const WaitingSetup waiting = findWaitingSetup();
    const std::vector<ToDo> found = whatIsToDo(waiting, last.login, last.isRunning, user);
    Report report;
    report.document = {{"waiting", toJson(waiting)}, {"lastLogin", nullptr}, {"toDo", Json::array()}};
    if (last.login) {
        report.document["lastLogin"] = toJson(record(*last.login), last.isRunning);
        report.document["lastLogin"]["begin"] = utcTime(beginning(*last.login).wallClock);
    }
    report.document["log"] = {{"source", last.source.empty() ? Json() : Json(last.source)},
                              {"note", last.note.empty() ? Json() : Json(last.note)}};
    report.line("Item:        " + itemText(waiting)).line("Agent:       " + agentText(waiting));
    report.line("They fit:    " + fitText(waiting));
    addLastLogin(report, last);
    report.line(found.empty() ? "Nothing is to be done." : "To be done:");
    for (const ToDo& each : found) {
        report.document["toDo"].push_back({{"what", each.what}, {"advice", each.advice}});
        report.line("  " + each.what).line("    advice: " + each.advice);
    }
    if (!found.empty()) {
        report.failure = found.size() == 1 ? "one thing is to be done"
                                           : std::to_string(found.size()) + " things are to be done";
    }
    return report;
}

} // namespace

void addStatusCommand(CommandLine& commandLine) {
    // Of another user, the log is read by root, who may.
    const auto readBefore = std::make_shared<std::optional<LastLogin>>();
    CommandLevel command = commandLine.addCommand(
        "status",
        "Show what waits for the next login, what the last one did, and what is to be done; exit status 0: "
        "nothing is, 1: something is",
        [readBefore](Session& session) {
            return showStatus(*readBefore ? **readBefore : lastLogin(queryOfCaller(session.options.root)),
                              session.options.user);
        });
    commandLine.addUserOption(command);
    commandLine.addPreparation(command, [readBefore](const Options& options) {
        if (!options.user.empty()) {
            const posix::PasswordEntry user = userToActFor(options.user);
            *readBefore = lastLogin({.root = options.root, .userID = user.userID, .userName = user.name});
        }
    });
}

} // namespace welcomer::tool
