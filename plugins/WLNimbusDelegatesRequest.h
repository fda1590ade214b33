// The part of an account request that names the delegates, and what is asked of their responses.

#pragma once

#include "propertylist/PropertyList.h"

#include <optional>
#include <string>
#include <vector>

namespace welcomer {

// Builds the request from every plug-in's own part: under platform::kDelegatesKey a dictionary from delegate
// identifier to request. A plug-in that raises or leaves itself out costs one log line and is left out. The
// former online service takes part with an empty dictionary.
//  additionalDelegates  identifiers with their requests; they replace those of the same identifier
//  omittedDelegates     the identifiers of plug-ins that are not asked
// Any thread, one call at a time: the plug-ins are called on it.
PropertyList::Dictionary WLNimbusDelegatesRequest(const PropertyList::Dictionary& additionalDelegates,
                                                  const std::vector<std::string>& omittedDelegates);

// The same with the two messaging delegates and the former online service alone.
PropertyList::Dictionary WLNimbusCreateOrLoginDelegatesRequestForMessagingAliases();

// The aliases that a delegate's response has on offer, as its plug-in reads them.
//  delegateIdentifier  whose response it is
//  response            handed to the plug-in as it stands
//  result              none without a plug-in of that identifier, or when it raises: that is logged
// Any thread, one call at a time.
std::optional<std::vector<std::string>>
WLNimbusGetMessagingAliasesFromDelegateResponse(const std::string& delegateIdentifier,
                                                const PropertyList& response);

// The former online service's identifier, then every plug-in's in the registry's order. A plug-in that raises
// or has none is left out silently.
std::vector<std::string> WLNimbusAllDelegateIdentifiers();

// The identifiers of the app store and the e-book store. Any thread.
std::vector<std::string> WLNimbusStoreDelegateIdentifiers();

} // namespace welcomer
