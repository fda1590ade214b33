#include "tools/welcomer/login/WaitingSetup.h"

#include "handoff/LaunchAgentFile.h"
#include "handoff/ReplayItem.h"
#include "platform/Platform.h"
#include "propertylist/Lookup.h"
#include "propertylist/PropertyListReader.h"

#include <optional>

namespace welcomer::tool {

namespace {

// Why this definition starts no agent, or nothing.
std::string problemOf(const std::optional<std::string>& definition) {
    if (!definition) {
        return "it cannot be read";
    }
    const PropertyListReadResult read = readPropertyList(*definition);
    if (!read) {
        return "it is no property list: " + read.error;
    }
    const PropertyList* const runAtLoad = valueIn(*read.value, "RunAtLoad");
    if (!runAtLoad || runAtLoad->boolean() != true) {
        return "it does not say that it starts at the login";
    }
    const auto arguments = textsIn(*read.value, "ProgramArguments");
    const std::string program = arguments && !arguments->empty() ? arguments->front() : "";
    if (program.empty() || !platform::current().fileSystem.exists(program)) {
        return "the program that it names is not there: " + (program.empty() ? "none" : program);
    }
    return "";
}

} // namespace

bool WaitingSetup::hasItem() const {
    return itemStatus == platform::kCredentialSuccess;
}

bool WaitingSetup::fits() const {
    return hasItem() == hasAgent && agentProblem.empty();
}

WaitingSetup findWaitingSetup() {
    const platform::Platform& platform = platform::current();
    // More would ask the user to unlock the keyring.
    const platform::CredentialFinding found = platform.credentialStore.findItem(
        kReplayItemService, kReplayItemAccount, platform::CredentialWish::Presence);
    WaitingSetup waiting;
    waiting.itemStatus = found.status;
    waiting.store = found.reference ? found.reference->store().name : "";
    waiting.account = found.item.label;
    waiting.agentPath = launchAgentPath(platform.processIdentity.homeDirectory());
    waiting.hasAgent = platform.fileSystem.exists(waiting.agentPath);
    if (waiting.hasAgent) {
        waiting.agentProblem = problemOf(platform.fileSystem.readText(waiting.agentPath));
    }
    return waiting;
}

} // namespace welcomer::tool
