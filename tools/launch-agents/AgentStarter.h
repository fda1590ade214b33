// How an agent is started, whatever starts it.

#pragma once

#include "platform/Error.h"
#include "tools/launch-agents/LaunchAgent.h"

#include <chrono>
#include <cstdint>
#include <optional>
#include <string>

namespace welcomer::launch {

// One run of an agent, as its lines in the journal are found by.
struct AgentRun {
    std::string invocation;          // the ID of its unit's invocation
    std::uint32_t process = 0;       // its process ID
    std::chrono::microseconds start; // on the monotonic clock
};

class AgentStarter {
  public:
    virtual ~AgentStarter() = default;

    // Starts the agent, which outlives this process, and does not wait for it.
    virtual platform::Outcome start(const LaunchAgent& agent) = 0;

    // Waits until an agent that was started here has ended, where its lines in the journal can be told from all
    // others.
    //  result  the run; none where they cannot: then it may still run
    virtual std::optional<AgentRun> waitForEnd(const LaunchAgent& agent) = 0;
};

} // namespace welcomer::launch
