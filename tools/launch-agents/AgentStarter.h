// How an agent is started, whatever starts it.

#pragma once

#include "platform/Error.h"
#include "tools/launch-agents/LaunchAgent.h"

namespace welcomer::launch {

class AgentStarter {
  public:
    virtual ~AgentStarter() = default;

    // Starts the agent, which outlives this process, and does not wait for it.
    virtual platform::Outcome start(const LaunchAgent& agent) = 0;
};

} // namespace welcomer::launch
