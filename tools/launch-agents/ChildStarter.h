// Agents as children, where there is no user manager.

#pragma once

#include "tools/launch-agents/AgentStarter.h"

#include <string>

namespace welcomer::launch {

// Each agent is the leader of a session of its own, so that neither the end of this process nor that of its
// terminal ends it. Its standard input is empty and its output goes nowhere.
class ChildStarter final : public AgentStarter {
  public:
    //  home  the folder that the agents start in
    explicit ChildStarter(std::string home) : _home(std::move(home)) {}

    platform::Outcome start(const LaunchAgent& agent) override;
    // Does not wait: nothing in the log is certain to be the child's.
    std::optional<AgentRun> waitForEnd(const LaunchAgent& /*agent*/) override { return std::nullopt; }

  private:
    std::string _home;
};

} // namespace welcomer::launch
