// The backends of time, run loops and queues that the contract suites run against.

#pragma once

#include "backends/local/LocalClock.h"
#include "backends/local/LocalDispatchQueues.h"
#include "backends/local/LocalRunLoops.h"
#include "backends/simulated/VirtualTime.h"

#include <gtest/gtest.h>

#include <string>

namespace welcomer::contract {

// The suites use nothing but what the members give. Simulated time runs every block on the waiting thread, so
// a suite has something done "meanwhile" by posting it to the global queue with a delay, not on a thread of
// its own.
struct LocalTime {
    local::LocalClock clock;
    local::LocalRunLoops runLoops;
    local::LocalDispatchQueues dispatchQueues;
};

struct SimulatedTime {
    simulated::VirtualTime time;
    platform::Clock& clock = time;
    platform::RunLoops& runLoops = time;
    platform::DispatchQueues& dispatchQueues = time;
};

using TimeBackends = testing::Types<LocalTime, SimulatedTime>;

struct TimeBackendNames {
    template <typename Backend>
    static std::string GetName(int) {
        return std::is_same_v<Backend, LocalTime> ? "Local" : "Simulated";
    }
};

// Longer than any test may take: a wait that lasts this long has failed.
constexpr std::chrono::seconds tooLong{60};

} // namespace welcomer::contract
