// Agents as services of the user manager, where one runs.

#pragma once

#include "backends/bus/BusCall.h"
#include "tools/launch-agents/AgentStarter.h"
#include "tools/shared/AgentUnit.h"

#include <memory>
#include <optional>
#include <string>

namespace welcomer::launch {

// Each agent is a transient service of its own, which stays when it has ended, however it ended, so that its
// status can be asked: as "active (exited)" or "failed", until the user manager ends or a later login starts
// the agent again. The user manager sees to its environment and its output.
class UserManagerStarter final : public AgentStarter {
  public:
    // Looks for the user manager on the session's bus, then on the bus in the runtime folder. A bus that is
    // only just starting has no user manager on it yet: on a machine that systemd runs, it is given ten
    // seconds to appear.
    //  runtimeFolder  the login's own folder, or empty
    //  result         none when there is no user manager
    static std::unique_ptr<UserManagerStarter> connect(const std::string& runtimeFolder);

    // Done once the user manager has accepted the service; that its program cannot be run is for the manager
    // to say. Where an earlier login's service is still there, and has ended, it makes room.
    platform::Outcome start(const LaunchAgent& agent) override;

    std::optional<AgentRun> waitForEnd(const LaunchAgent& agent) override;

  private:
    explicit UserManagerStarter(bus::Bus bus) : _bus(std::move(bus)) {}

    static bool _waitForUserManager(sd_bus* bus);

    // The object of a unit that is loaded, or empty.
    std::string _unit(const std::string& name);
    std::string _subState(const std::string& unit);
    std::string _invocation(const std::string& unit);
    AgentRun _run(const std::string& unit, std::string invocation);
    // Has what tells of units and their changes come here.
    bool _listen();
    void _removeEnded(const std::string& name);

    const bus::Bus _bus;
    bool _isListening = false;
};

} // namespace welcomer::launch
