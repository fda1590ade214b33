// The part of an account request that names the delegates, and what is asked of their responses.

#pragma once

#include "plugins/DelegatePluginSource.h"
#include "propertylist/PropertyList.h"

#include <optional>
#include <string>
#include <vector>

namespace welcomer {

// The one key of a delegates request. Its value maps delegate identifiers to their requests.
inline constexpr const char* kRequestDelegatesKey = "delegates";

// Builds the request from every plug-in's own part. A plug-in that raises or leaves itself out costs one log
// line and is left out. The former online service takes part with an empty dictionary.
//  additionalDelegates  identifiers with their requests; they replace those of the same identifier
//  omittedDelegates     the identifiers of plug-ins that are not asked
//  plugins              where the plug-ins come from
// Any thread, one call at a time: the plug-ins are called on it.
PropertyList::Dictionary
WLNimbusDelegatesRequest(const PropertyList::Dictionary& additionalDelegates,
                         const std::vector<std::string>& omittedDelegates,
                         const DelegatePluginSource& plugins = WLNimbusDelegatePlugins);

// The same with the two messaging delegates and the former online service alone.
PropertyList::Dictionary WLNimbusCreateOrLoginDelegatesRequestForMessagingAliases(
    const DelegatePluginSource& plugins = WLNimbusDelegatePlugins);

// The aliases that a delegate's response has on offer, as its plug-in reads them.
//  delegateIdentifier  whose response it is
//  response            handed to the plug-in as it stands
//  result              none without a plug-in of that identifier, or when it raises: that is logged
// Any thread, one call at a time.
std::optional<std::vector<std::string>> WLNimbusGetMessagingAliasesFromDelegateResponse(
    const std::string& delegateIdentifier, const PropertyList& response,
    const DelegatePluginSource& plugins = WLNimbusDelegatePlugins);

// The former online service's identifier, then every plug-in's in the registry's order. A plug-in that raises
// or has none is left out silently.
std::vector<std::string>
WLNimbusAllDelegateIdentifiers(const DelegatePluginSource& plugins = WLNimbusDelegatePlugins);

// The identifiers of the app store and the e-book store. Any thread.
std::vector<std::string> WLNimbusStoreDelegateIdentifiers();

} // namespace welcomer
