// Enabling the services of the user's cloud account.

#pragma once

#include "platform/Error.h"
#include "platform/Window.h"
#include "propertylist/PropertyList.h"

#include <memory>
#include <string>
#include <vector>

namespace welcomer {

// Enables the account's services that belong to one phase and that the user kept selected. Everything that is
// decided is logged, one line for each service.
//  setupDictionary              only its kSKPropertyAccountID entry is read, and passed on as it is
//  selectedServices             service identifiers; a service that is not among them counts as opted out
//  accountAndKeyValueStoreOnly  enables documents and data alone, whatever the phase and the selection
//  postLogin                    the phase: after the user's first login, or before it
//  window                       the parent of what the account service shows while enabling, or null to have
//                               it done silently; held until the last service has been enabled
//  errorOut                     never written; may be null
//  result                       false only when there is no account; how the services fared is in the log
// Any thread. After login, calendars and reminders are enabled later, on the global queue: 3 seconds after
// the call, or as many as the integer default "WLDebugPostLoginDelay" says when it is above 0. They are
// enabled only if the process still lives then.
bool WLNimbusSetupWithDictionary2(const PropertyList::Dictionary& setupDictionary,
                                  const std::vector<std::string>& selectedServices,
                                  bool accountAndKeyValueStoreOnly, bool postLogin,
                                  const std::shared_ptr<platform::Window>& window, platform::Error* errorOut);

// The same before login, for all of the phase's services: the entry for the hosting setup application.
bool WLNimbusSetupWithDictionary(const PropertyList::Dictionary& setupDictionary,
                                 const std::vector<std::string>& selectedServices,
                                 const std::shared_ptr<platform::Window>& window);

} // namespace welcomer
