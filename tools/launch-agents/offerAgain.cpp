#include "tools/launch-agents/offerAgain.h"

#include "agent/wlnimbussetup.h"
#include "backends/posix/AtomicFile.h"
#include "backends/posix/FileDescriptor.h"
#include "handoff/LaunchAgentFile.h"
#include "handoff/ReplayItem.h"
#include "log/PCLogManager.h"
#include "platform/CredentialStore.h"
#include "platform/Error.h"
#include "propertylist/PropertyListReader.h"
#include "propertylist/PropertyListWriter.h"
#include "tools/launch-agents/AgentJournal.h"

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <fcntl.h>
#include <system_error>

namespace welcomer::launch {

namespace {

constexpr mode_t kFileMode = 0644;
// What is on its way to the journal when the agent has ended.
constexpr std::chrono::seconds kJournalPatience{10};

// Whether a status says that the item could not be asked for, and nothing else: it may be there next time.
bool mayBeAskedNextTime(std::int32_t status) {
    switch (status) {
    case platform::kCredentialLocked:
    case platform::kCredentialDismissed:
    case platform::kCredentialPromptUnanswered:
    case platform::kCredentialNoService:
    case platform::kCredentialNoBus:
    case platform::kCredentialFindTimedOut:
    case platform::kCredentialStartFailed:
    case platform::kCredentialBusDied:
        return true;
    default:
        return false;
    }
}

std::int64_t offersOf(const PropertyList& definition) {
    const PropertyList* const offers = definition.find(kOffersKey);
    return offers && offers->integer() ? std::max<std::int64_t>(*offers->integer(), 0) : 0;
}

// The definition in this content that says one offer more.
//  offers  receives how many it says
//  result  none where it was offered often enough, or cannot be written
std::optional<std::string> withOneOfferMore(const std::string& content, std::int64_t& offers) {
    const PropertyListReadResult read = readPropertyList(content);
    if (!read || !read.value->isDictionary()) {
        return std::nullopt;
    }
    offers = offersOf(*read.value) + 1;
    if (offers > kMostOffers) {
        return std::nullopt;
    }
    PropertyList::Dictionary definition = *read.value->dictionary();
    definition.insert_or_assign(kOffersKey, PropertyList(offers));
    return writeXMLPropertyList(definition);
}

int createIn(const std::string& folder, const std::string& name, const std::string& content) {
    const posix::FileDescriptor opened(::open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    return opened ? posix::createFile(opened.get(), name, content, kFileMode) : errno;
}

} // namespace

std::optional<std::int32_t> statusOfUnaskedItem(const std::vector<std::string>& lines) {
    if (lines.size() < 2 || lines.back() != kAgentExitingMessage) {
        return std::nullopt;
    }
    const std::optional<std::int32_t> status = replayItemNotFoundStatus(lines.end()[-2]);
    return status && mayBeAskedNextTime(*status) ? status : std::nullopt;
}

void putBack(const std::string& folder, const LaunchAgent& agent, std::int32_t status) {
    std::int64_t offers = 0;
    const std::optional<std::string> content = withOneOfferMore(agent.content, offers);
    if (!content) {
        WL_LOG("Launch agent %@ is not offered once more: %@", agent.label,
               platform::credentialStatusText(status));
        return;
    }
    const int error = createIn(folder, agent.file, *content);
    if (error == EEXIST) {
        return;
    }
    if (error != 0) {
        WL_LOG("Failed to offer launch agent %@ again: %@", agent.label,
               std::generic_category().message(error));
        return;
    }
    WL_LOG("Launch agent %@ is offered again at the next login (%ld of %d): %@", agent.label, offers,
           kMostOffers, platform::credentialStatusText(status));
}

void offerAgain(const std::string& folder, StartedAgents started) {
    const auto agent = std::ranges::find_if(started.agents, [](const LaunchAgent& each) {
        return each.label == kLaunchAgentLabel && each.file == launchAgentFileName(kLaunchAgentLabel);
    });
    if (agent == started.agents.end()) {
        return;
    }
    const std::optional<AgentRun> run = started.starter->waitForEnd(*agent);
    if (!run) {
        return;
    }
    const std::vector<std::string> lines =
        readAgentLines(*run, kAgentProgramName, kAgentExitingMessage, kJournalPatience);
    if (const std::optional<std::int32_t> status = statusOfUnaskedItem(lines)) {
        putBack(folder, *agent, *status);
    }
}

} // namespace welcomer::launch
