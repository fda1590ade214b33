#include "agent/wlnimbussetup_RemainingDelegateSetup.h"

#include "agent/DelegateCompletion.h"
#include "handoff/ReplayItem.h"
#include "log/PCLogManager.h"
#include "platform/Platform.h"
#include "plugins/DelegateIdentifiers.h"
#include "plugins/PluginText.h"
#include "plugins/WLNimbusDelegatePlugins.h"
#include "propertylist/Lookup.h"
#include "text/Format.h"

#include <exception>
#include <map>
#include <utility>
#include <vector>

namespace welcomer {

namespace {

using Aliases = std::optional<std::vector<std::string>>;

// One delegate that has a response.
struct DelegateWork {
    std::shared_ptr<WLFirstRunDelegateConfiguration> plugin;
    PropertyList response;
};

long count(const Aliases& aliases) {
    return aliases ? static_cast<long>(aliases->size()) : 0;
}

const PropertyList* findResponse(const PropertyList& replayObject,
                                 const std::optional<std::string>& identifier) {
    const PropertyList* delegates =
        valueIn(valueIn(replayObject, kReplayResponsesKey), platform::kDelegatesKey);
    return identifier ? valueIn(delegates, *identifier) : nullptr;
}

void queueMessaging(const std::shared_ptr<DelegateCompletion>& completion, DelegateWork delegate,
                    const Aliases& aliases) {
    completion->queue([completion, delegate = std::move(delegate), aliases] {
        completion->completeWithAliases(*delegate.plugin, delegate.response, aliases);
    });
}

void queueOther(const std::shared_ptr<DelegateCompletion>& completion, DelegateWork delegate) {
    completion->queue([completion, delegate = std::move(delegate)] {
        completion->complete(*delegate.plugin, delegate.response);
    });
}

} // namespace

void wlnimbussetup_RemainingDelegateSetup(const PropertyList& replayObject,
                                          [[maybe_unused]] const std::optional<std::string>& text,
                                          const std::shared_ptr<platform::WorkGroup>& group) {
    const Aliases vidlinkAliases = textsIn(replayObject, kReplayVidlinkAliasesKey);
    const Aliases chatterAliases = textsIn(replayObject, kReplayChatterAliasesKey);
    WL_LOG("Vidlink: %ld aliases", count(vidlinkAliases));
    WL_LOG("Chatter: %ld aliases", count(chatterAliases));

    std::map<std::string, DelegateWork> work;
    for (const auto& plugin : WLNimbusDelegatePlugins()) {
        std::optional<std::string> identifier;
        try {
            identifier = plugin->delegateIdentifier();
        } catch (...) {
            WL_LOG("exception querying plugin %@ for id: %@", *plugin, std::current_exception());
            continue;
        }
        if (const PropertyList* response = findResponse(replayObject, identifier)) {
            work.insert_or_assign(*identifier, DelegateWork{plugin, *response});
        } else {
            WL_LOG("no cached response for %@",
                   identifier ? std::optional(pluginText(*identifier)) : std::nullopt);
        }
    }

    platform::DispatchQueues& queues = platform::current().dispatchQueues;
    const auto messagingQueue =
        queues.createSerial("com.corvid.wlnimbussetup -- com.corvid.vidlink & com.corvid.chatter");
    for (auto& [identifier, delegate] : work) {
        const bool isVidlink = identifier == kVidlinkIdentifier;
        const bool isMessaging = isVidlink || identifier == kChatterIdentifier;
        const auto queue =
            isMessaging ? messagingQueue
                        : queues.createSerial(text::format("com.corvid.wlnimbussetup -- %@", identifier));
        WL_LOG("setting up %@", pluginText(identifier));
        const auto completion = std::make_shared<DelegateCompletion>(identifier, group, queue);
        try {
            if (isMessaging) {
                queueMessaging(completion, std::move(delegate), isVidlink ? vidlinkAliases : chatterAliases);
            } else {
                queueOther(completion, std::move(delegate));
            }
        } catch (...) {
            completion->raised(std::current_exception()); // no memory for the job: nobody must wait for it
        }
    }
}

} // namespace welcomer
