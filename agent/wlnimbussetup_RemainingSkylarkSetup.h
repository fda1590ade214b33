// The agent's first setup stage: the account's post-login services.

#pragma once

#include "platform/DispatchQueue.h"

#include <memory>
#include <string>

namespace welcomer {

// Ends the user's online-accounts preference process, so that it holds no stale account state, and enables
// the account's post-login services. What fails is logged and changes nothing in the agent's course.
//  accountName  the cloud account's user name, passed on as it is
//  group        not used: nothing here enters or leaves it
// Main thread; blocks while the preference process is being ended. Calendars and reminders are enabled later,
// see WLNimbusSetupWithDictionary2. Throws only what the launcher throws that is no std::exception.
void wlnimbussetup_RemainingSkylarkSetup(const std::string& accountName,
                                         const std::shared_ptr<platform::WorkGroup>& group);

} // namespace welcomer
