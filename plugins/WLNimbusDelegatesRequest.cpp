#include "plugins/WLNimbusDelegatesRequest.h"

#include "log/PCLogManager.h"
#include "platform/AccountService.h"
#include "plugins/DelegateIdentifiers.h"
#include "plugins/PluginText.h"
#include "plugins/WLNimbusDelegatePlugins.h"
#include "text/Contains.h"

#include <stdexcept>
#include <utility>

namespace welcomer {

namespace {

constexpr char kUnknownIdentifier[] = "(unknown)";

using text::contains;

// Asks the plug-ins that `isWanted` accepts, given their identifier, for their requests.
template <class IsWanted>
PropertyList::Dictionary requestsOfPlugins(const IsWanted& isWanted) {
    PropertyList::Dictionary requests;
    for (const auto& plugin : WLNimbusDelegatePlugins()) {
        std::optional<std::string> identifier;
        try {
            identifier = plugin->delegateIdentifier();
            if (!isWanted(identifier)) {
                continue;
            }
            std::optional<PropertyList> request = plugin->delegateSetupRequest();
            if (!request) {
                WL_LOG("Nimbus Plugins: Delegate %@ omits itself from Nimbus setup",
                       identifier ? std::optional(pluginText(*identifier)) : std::nullopt);
                continue;
            }
            if (!identifier) {
                throw std::invalid_argument("a request needs its delegate's identifier");
            }
            requests.insert_or_assign(*identifier, *std::move(request));
        } catch (...) {
            WL_LOG("Nimbus Plugins: Exception querying '%@' for setup request: %@",
                   pluginText(identifier.value_or(kUnknownIdentifier)), std::current_exception());
        }
    }
    return requests;
}

PropertyList::Dictionary delegatesRequest(PropertyList::Dictionary requests) {
    return {{platform::kDelegatesKey, std::move(requests)}};
}

} // namespace

PropertyList::Dictionary WLNimbusDelegatesRequest(const PropertyList::Dictionary& additionalDelegates,
                                                  const std::vector<std::string>& omittedDelegates) {
    PropertyList::Dictionary requests = requestsOfPlugins([&](const std::optional<std::string>& identifier) {
        return !identifier || !contains(omittedDelegates, *identifier);
    });
    if (!contains(omittedDelegates, kSkylarkIdentifier)) {
        requests.insert_or_assign(kSkylarkIdentifier, PropertyList::Dictionary{});
    }
    for (const auto& [identifier, request] : additionalDelegates) {
        requests.insert_or_assign(identifier, request);
    }
    return delegatesRequest(std::move(requests));
}

PropertyList::Dictionary WLNimbusCreateOrLoginDelegatesRequestForMessagingAliases() {
    PropertyList::Dictionary requests = requestsOfPlugins([](const std::optional<std::string>& identifier) {
        return identifier == kVidlinkIdentifier || identifier == kChatterIdentifier;
    });
    requests.insert_or_assign(kSkylarkIdentifier, PropertyList::Dictionary{});
    return delegatesRequest(std::move(requests));
}

std::optional<std::vector<std::string>>
WLNimbusGetMessagingAliasesFromDelegateResponse(const std::string& delegateIdentifier,
                                                const PropertyList& response) {
    for (const auto& plugin : WLNimbusDelegatePlugins()) {
        try {
            if (plugin->delegateIdentifier() == delegateIdentifier) {
                return plugin->messagingAliasesFromResponse(response);
            }
        } catch (...) {
            WL_LOG("Nimbus Plugins: Exception querying '%@' for aliases: %@",
                   pluginText(delegateIdentifier.empty() ? kUnknownIdentifier : delegateIdentifier),
                   std::current_exception());
        }
    }
    return std::nullopt;
}

std::vector<std::string> WLNimbusAllDelegateIdentifiers() {
    std::vector<std::string> identifiers{kSkylarkIdentifier};
    for (const auto& plugin : WLNimbusDelegatePlugins()) {
        try {
            std::optional<std::string> identifier = plugin->delegateIdentifier();
            if (identifier && !identifier->empty()) {
                identifiers.push_back(*std::move(identifier));
            }
        } catch (...) {
            // Left out without a word: whoever builds a request from the list learns of it there.
        }
    }
    return identifiers;
}

std::vector<std::string> WLNimbusStoreDelegateIdentifiers() {
    return {kStorefrontIdentifier, kReaderIdentifier};
}

} // namespace welcomer
