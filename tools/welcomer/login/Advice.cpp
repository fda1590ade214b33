#include "tools/welcomer/login/Advice.h"

#include "platform/CredentialStore.h"
#include "tools/welcomer/login/AgentTexts.h"
#include "tools/welcomer/login/LoginReport.h"

#include <array>
#include <string_view>
#include <utility>

namespace welcomer::tool {

namespace {

// In an advice, behind a command that can be given for another user.
constexpr std::string_view kUser = "{user}";

// Why the last login has left the item where it is; empty where it did not say so.
std::string whyItStayed(const std::optional<LoginRecord>& record) {
    return record && record->itemStatus() && *record->itemStatus() != platform::kCredentialItemNotFound
               ? " (at the last login: " + platform::credentialStatusText(*record->itemStatus()) + ")"
               : "";
}

void judgeWaiting(std::vector<ToDo>& found, const WaitingSetup& waiting,
                  const std::optional<LoginRecord>& record) {
    const std::string both =
        "welcomer replay arm{user} installs the agent; welcomer setup --cancel{user} gives the setup up";
    if (waiting.hasItem() && !waiting.hasAgent) {
        found.push_back({"an item waits, but no agent will start for it" + whyItStayed(record), both});
    } else if (waiting.hasAgent && !waiting.agentProblem.empty()) {
        found.push_back({"the agent's file starts no agent: " + waiting.agentProblem,
                         waiting.hasItem() ? both : "welcomer setup --cancel{user} removes it"});
    } else if (waiting.hasAgent && waiting.itemStatus == platform::kCredentialItemNotFound) {
        found.push_back({"the agent will start, but there is no item for it",
                         "welcomer setup --cancel{user} removes the agent's file"});
    }
    if (!waiting.hasItem() && waiting.itemStatus != platform::kCredentialItemNotFound) {
        found.push_back(
            {"whether an item waits cannot be told: " + platform::credentialStatusText(waiting.itemStatus),
             "ask in the user's own session, with the keyring unlocked; welcomer doctor says who serves"});
    }
}

// What can be done about a failure that the agent logged.
std::string adviceOn(std::string_view failure) {
    constexpr std::array<std::pair<std::string_view, const char*>, 7> kAdvice{
        {{agenttext::kItemUnreadable, "welcomer setup --cancel{user} removes the item; then set up again"},
         {agenttext::kItemStays, "welcomer replay show{user} says whether it is still there, welcomer replay "
                                 "delete{user} removes it"},
         {agenttext::kNoAccount,
          "welcomer account list{user} shows the accounts; sign in, then welcomer services enable{user}"},
         {agenttext::kNotKilled, "install the program killall (Debian's package psmisc)"},
         {agenttext::kFileStays, "see who may write to the folder Library/LaunchAgents in the home folder"},
         {agenttext::kPluginRefused, "welcomer plugins list shows its file; ask who makes it"},
         {agenttext::kPluginWithoutIdentifier, "welcomer plugins list shows its file; ask who makes it"}}};
    for (const auto& [beginning, advice] : kAdvice) {
        if (failure.starts_with(beginning)) {
            return advice;
        }
    }
    return "welcomer log{user} shows what came before it";
}

void judgeDelegates(std::vector<ToDo>& found, const LoginRecord& record, bool isRunning) {
    using Kind = DelegateOutcome::Kind;
    for (const DelegateOutcome& delegate : record.delegates()) {
        if (delegate.kind != Kind::Completed && delegate.kind != Kind::NoResponse &&
            !(delegate.working() && isRunning)) {
            found.push_back({delegate.identifier + " " + outcomeText(delegate, isRunning),
                             "finish it in its own application, or set up again"});
        }
    }
}

void judgeServices(std::vector<ToDo>& found, const LoginRecord& record, bool isRunning) {
    using Kind = ServiceOutcome::Kind;
    for (const ServiceOutcome& service : record.services()) {
        if (service.kind == Kind::Refused || (service.kind == Kind::PutOff && !isRunning)) {
            found.push_back(
                {service.identifier + ": " + service.text(),
                 "welcomer account services{user} shows whether it can be enabled by now, welcomer "
                 "services enable{user} --phase post enables it"});
        }
    }
}

void judgeEnd(std::vector<ToDo>& found, const LoginRecord& record) {
    if (record.end() == LoginRecord::End::Broken) {
        found.push_back({"the agent was " + record.endReason(),
                         "welcomer plugins list shows the plug-in's file; take it "
                         "out, ask who makes it, and set up again"});
    } else if (record.end() == LoginRecord::End::Unfinished) {
        found.push_back(
            {"the agent of the last login was ended before it was done",
             "what is listed as not answered or not enabled is to be done by hand, or set up again"});
    }
}

// An advice with its commands for whoever is asked for.
std::string adviceFor(const std::string& user, std::string advice) {
    const std::string option = user.empty() ? "" : " --user " + user;
    for (std::size_t at = advice.find(kUser); at != std::string::npos;
         at = advice.find(kUser, at + option.size())) {
        advice.replace(at, kUser.size(), option);
    }
    return advice;
}

std::vector<ToDo> judge(const WaitingSetup& waiting, const std::optional<Login>& login, bool isRunning) {
    std::vector<ToDo> found;
    const auto agents = login && login->hasAgent ? std::optional(record(*login)) : std::nullopt;
    judgeWaiting(found, waiting, agents);
    if (login && !login->hasAgent) {
        for (const LogLine& line : login->lines) {
            found.push_back(
                {"at the last login: " + line.message, "welcomer doctor says what starts agents here"});
        }
    }
    if (!agents || waiting.hasItem()) {
        return found;
    }
    judgeDelegates(found, *agents, isRunning);
    judgeServices(found, *agents, isRunning);
    for (const std::string& failure : agents->failures()) {
        // A file that is gone now has not kept the agent from running once.
        if (waiting.hasAgent || !failure.starts_with(agenttext::kFileStays)) {
            found.push_back({failure, adviceOn(failure)});
        }
    }
    if (!isRunning) {
        judgeEnd(found, *agents);
    }
    return found;
}

} // namespace

std::vector<ToDo> whatIsToDo(const WaitingSetup& waiting, const std::optional<Login>& login, bool isRunning,
                             const std::string& user) {
    std::vector<ToDo> found = judge(waiting, login, isRunning);
    for (ToDo& each : found) {
        each.advice = adviceFor(user, each.advice);
    }
    return found;
}

} // namespace welcomer::tool
