// Whether the logged-in user is to be offered the sync setup.

#pragma once

namespace welcomer {

// Whether to offer the sync setup at this login: a cloud account is logged in, its sync is off, the screen
// lock asks for a password, and the user has not seen both sync setups yet. Where sync is on or the screen
// lock off, the sync setup is recorded as seen on the shared per-user record; storing that is the caller's
// business. Any thread; blocks for as long as the account service takes.
bool WLCurrentUserGetsSyncUpsell();

} // namespace welcomer
