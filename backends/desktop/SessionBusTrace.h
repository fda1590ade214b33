// What tells of a session bus without a connection to it, or to a library that could make one.

#pragma once

namespace welcomer::desktop {

// Whether the environment names a session bus that may be there: costs no connection. Any thread.
bool mayHaveSessionBus();

} // namespace welcomer::desktop
