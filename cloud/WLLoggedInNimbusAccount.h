// Questions about the account that is logged in.

#pragma once

#include "platform/AccountService.h"

#include <memory>

namespace welcomer {

// The account that the account service reports as logged in for the current user, or null. Any thread, as all
// of these.
std::shared_ptr<platform::CloudAccount> WLLoggedInNimbusAccount();

// Whether an account is logged in.
bool WLHasLoggedInNimbusAccount();

// Whether none of the services that setup may enable is enabled for the logged-in account. Without an account
// the account service's answers for none decide.
bool WLNoNimbusServicesEnabled();

} // namespace welcomer
