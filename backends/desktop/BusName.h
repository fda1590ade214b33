// Who has a name on a bus, asked of the bus alone. For modules only.

#pragma once

#include <gio/gio.h>

namespace welcomer::desktop {

// In what state a service is that a name on a bus stands for.
enum class BusName {
    Unknown,   // the bus does not answer
    Nobody,    // it does not run, and the bus knows nothing that it could start
    Startable, // it does not run; the bus can start it
    Owned,     // it runs
};

// Looks at a name without starting anybody.
//  milliseconds  how long the bus may take for each of up to two answers
// Any thread.
BusName lookAtBusName(GDBusConnection* bus, const char* name, int milliseconds);

// How long a report waits for a service's answer, in milliseconds: what takes longer does not answer.
inline constexpr int kReportMilliseconds = 5'000;

} // namespace welcomer::desktop
