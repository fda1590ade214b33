// The completion handlers that plug-ins hold.

#pragma once

#include "plugins/WLFirstRunDelegateConfiguration.h"
#include "sdk/welcomer/delegate_plugin.h"

namespace welcomer {

// A handler in the form in which it crosses to a plug-in. What crosses is a number and not an address: a
// plug-in may call its handler twice, from any thread, long after the instance raised, or keep it for ever,
// and a number that is spent is simply not found. Numbers are drawn at random: no plug-in can end another one's
// setup by guessing. Nothing is left behind for a handler that was called or revoked. Throws when there is no
// memory or no randomness. Any thread.
wl_completion_handler issueCompletionHandler(WLFirstRunDelegateConfiguration::CompletionHandler handler);

// Has a handler do nothing from now on; a call that is under way on another thread is not waited for. Any
// thread.
void revokeCompletionHandler(const wl_completion_handler& handler);

} // namespace welcomer
