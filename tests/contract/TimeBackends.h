// The backends of time, run loops and queues that the contract suites run against.

#pragma once

#include "backends/local/time/LocalClock.h"
#include "backends/local/time/LocalDispatchQueues.h"
#include "backends/local/time/LocalRunLoops.h"
#include "backends/simulated/VirtualTime.h"
#ifdef WELCOMER_DESKTOP_RUNLOOP
#include "backends/desktop/runloop/DesktopRunLoops.h"
#endif

#include <gtest/gtest.h>

#include <string>

namespace welcomer::contract {

// The suites use nothing but what the members give. Simulated time runs every block on the waiting thread, so
// a suite has something done "meanwhile" by posting it to the global queue with a delay, not on a thread of
// its own.
struct LocalTime {
    // Whether others may attach sources of their own to its loops, which then never return early.
    static constexpr bool hasForeignSources = false;

    local::LocalClock clock;
    local::LocalRunLoops runLoops;
    local::LocalDispatchQueues dispatchQueues;
};

struct SimulatedTime {
    static constexpr bool hasForeignSources = false;

    simulated::VirtualTime time;
    platform::Clock& clock = time;
    platform::RunLoops& runLoops = time;
    platform::DispatchQueues& dispatchQueues = time;
};

#ifdef WELCOMER_DESKTOP_RUNLOOP
// GLib's main context on the main thread.
struct DesktopTime {
    static constexpr bool hasForeignSources = true;

    local::LocalClock clock;
    desktop::DesktopRunLoops runLoops;
    local::LocalDispatchQueues dispatchQueues;
};

using TimeBackends = testing::Types<LocalTime, SimulatedTime, DesktopTime>;
#else
using TimeBackends = testing::Types<LocalTime, SimulatedTime>;
#endif

struct TimeBackendNames {
    template <typename Backend>
    static std::string GetName(int) {
        if (std::is_same_v<Backend, LocalTime>) {
            return "Local";
        }
        return std::is_same_v<Backend, SimulatedTime> ? "Simulated" : "Desktop";
    }
};

// Longer than any test may take: a wait that lasts this long has failed.
constexpr std::chrono::seconds tooLong{60};

} // namespace welcomer::contract
