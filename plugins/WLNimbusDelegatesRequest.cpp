#include "plugins/WLNimbusDelegatesRequest.h"

#include "log/PCLogManager.h"
#include "plugins/DelegateIdentifiers.h"
#include "plugins/PluginText.h"

#include <algorithm>
#include <stdexcept>
#include <utility>

namespace welcomer {

namespace {

constexpr const char* kUnknownIdentifier = "(unknown)";

bool contains(const std::vector<std::string>& identifiers, const std::string& identifier) {
    return std::find(identifiers.begin(), identifiers.end(), identifier) != identifiers.end();
}

// Asks the plug-ins that `isWanted` accepts, given their identifier, for their requests.
template <class IsWanted>
PropertyList::Dictionary requestsOfPlugins(const DelegatePluginSource& plugins, const IsWanted& isWanted) {
    PropertyList::Dictionary requests;
    for (const auto& plugin : plugins()) {
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
    return {{kRequestDelegatesKey, std::move(requests)}};
}

} // namespace

PropertyList::Dictionary WLNimbusDelegatesRequest(const PropertyList::Dictionary& additionalDelegates,
                                                  const std::vector<std::string>& omittedDelegates,
                                                  const DelegatePluginSource& plugins) {
    PropertyList::Dictionary requests =
        requestsOfPlugins(plugins, [&](const std::optional<std::string>& identifier) {
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

PropertyList::Dictionary
WLNimbusCreateOrLoginDelegatesRequestForMessagingAliases(const DelegatePluginSource& plugins) {
    PropertyList::Dictionary requests =
        requestsOfPlugins(plugins, [](const std::optional<std::string>& identifier) {
            return identifier == kVidlinkIdentifier || identifier == kChatterIdentifier;
        });
    requests.insert_or_assign(kSkylarkIdentifier, PropertyList::Dictionary{});
    return delegatesRequest(std::move(requests));
}

std::optional<std::vector<std::string>>
WLNimbusGetMessagingAliasesFromDelegateResponse(const std::string& delegateIdentifier,
                                                const PropertyList& response,
                                                const DelegatePluginSource& plugins) {
    for (const auto& plugin : plugins()) {
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

std::vector<std::string> WLNimbusAllDelegateIdentifiers(const DelegatePluginSource& plugins) {
    std::vector<std::string> identifiers{kSkylarkIdentifier};
    for (const auto& plugin : plugins()) {
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
