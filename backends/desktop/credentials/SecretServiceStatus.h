// What the bus's and the Secret Service's errors mean to a credential store.

#pragma once

#include <cstdint>
#include <glib.h>

namespace welcomer::desktop {

// The status of a call that was not answered in time, within this module: each operation has a number of its
// own for it.
inline constexpr std::int32_t kTimedOut = -1;

// The platform::CredentialStatus that an error of a call stands for, or kTimedOut. Any thread.
std::int32_t statusOf(const GError* error);

} // namespace welcomer::desktop
