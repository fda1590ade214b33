#include "tools/welcomer/story/HandOver.h"

#include "handoff/LaunchAgentInstaller.h"
#include "handoff/ReplayItem.h"
#include "platform/Platform.h"
#include "tools/welcomer/story/ReplayReason.h"
#include "tools/welcomer/terminal/Failure.h"

#include <cstdint>

namespace welcomer::tool {

namespace {

// A command that is to be given for the same user.
std::string suggested(const std::string& command, const Caller& caller) {
    return "`welcomer " + command + (caller.user.empty() ? "" : " --user " + caller.user) + "`";
}

void removeAgent(const WaitingSetup& waiting) {
    const platform::Outcome removed = platform::current().fileSystem.remove(waiting.agentPath);
    if (!removed) {
        throw CommandFailure(removed.error.message);
    }
}

CommandFailure cannotTell(std::int32_t status) {
    return CommandFailure("cannot tell whether a replay item is waiting for the next login already: " +
                          platform::credentialStatusText(status) + storingAdvice(status));
}

} // namespace

void refuseWhereSomethingIsWaiting(const Caller& caller) {
    const WaitingSetup waiting = findWaitingSetup();
    const std::string cancelling = suggested("setup --cancel", caller);
    if (waiting.hasItem() && waiting.hasAgent) {
        throw CommandFailure("a replay item is waiting for the next login already; " + cancelling +
                             " takes it back");
    }
    if (waiting.hasItem()) {
        throw CommandFailure("a replay item is waiting, but no agent will start for it at the next login; " +
                             suggested("replay arm", caller) + " installs the agent, " + cancelling +
                             " removes the item");
    }
    if (waiting.itemStatus != platform::kCredentialItemNotFound && !caller.storesLocally) {
        throw cannotTell(waiting.itemStatus);
    }
    if (waiting.hasAgent) {
        throw CommandFailure("the agent is installed already: " + waiting.agentPath + "; " + cancelling +
                             " removes it");
    }
}

bool armAgent(const KeptLog& log, platform::ResourceBundle& bundle) {
    const WaitingSetup waiting = findWaitingSetup();
    if (waiting.itemStatus == platform::kCredentialItemNotFound) {
        throw CommandFailure("no replay item is waiting for which the agent could be installed");
    }
    if (!waiting.hasItem()) {
        throw cannotTell(waiting.itemStatus);
    }
    if (waiting.hasAgent && waiting.agentProblem.empty()) {
        return false;
    }
    if (waiting.hasAgent) {
        removeAgent(waiting); // what is there is never replaced
    }
    if (!installLaunchAgent(bundle)) {
        throw CommandFailure("cannot install the agent: " + log.reason());
    }
    return true;
}

WaitingSetup cancelHandOver(const KeptLog& log) {
    WaitingSetup waiting = findWaitingSetup();
    const bool hasNoItem = waiting.itemStatus == platform::kCredentialItemNotFound;
    if (hasNoItem && !waiting.hasAgent) {
        throw CommandFailure("nothing is waiting for the next login");
    }
    // An agent without an item ends at once; an item without an agent would be in every setup's way.
    std::int32_t status = platform::kCredentialSuccess;
    if (!hasNoItem && !WLDeleteNimbusReplayKeychainItem(status)) {
        throw CommandFailure("cannot delete the replay item: " + replayReason(log, status));
    }
    if (waiting.hasAgent) {
        removeAgent(waiting);
    }
    return waiting;
}

} // namespace welcomer::tool
