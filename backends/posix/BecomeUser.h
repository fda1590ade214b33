// A process that gives root's rights away for good.

#pragma once

#include "backends/posix/PasswordEntry.h"
#include "platform/Error.h"

namespace welcomer::posix {

// Turns this process, which is root's, into a user's: groups and ids of all kinds, no capability, and nothing
// that it starts gets any back. It has the environment of a fresh login, without a session's bus (the
// terminal's kind and the language stay), the umask 077 and the working folder "/". It cannot be traced or
// leave its memory behind, although it is the user's.
//  result  a failure leaves a process of neither kind: it has nothing left to do but end
// No other thread runs.
platform::Outcome becomeUser(const PasswordEntry& user);

} // namespace welcomer::posix
