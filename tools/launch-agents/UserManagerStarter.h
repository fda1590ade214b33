// Agents as services of the user manager, where one runs.

#pragma once

#include "tools/launch-agents/AgentStarter.h"
#include "tools/shared/BusCall.h"

#include <memory>
#include <string>
#include <string_view>

namespace welcomer::launch {

// The name of the unit that an agent with this label runs as: "welcomer-agent-LABEL.service", with what a
// unit's name cannot hold written as "\xNN".
std::string unitName(std::string_view label);

// Each agent is a transient service of its own, which goes away when it ends, however it ends. The user
// manager sees to its environment and its output.
class UserManagerStarter final : public AgentStarter {
  public:
    // Looks for the user manager on the session's bus, then on the bus in the runtime folder. A bus that is
    // only just starting has no user manager on it yet: on a machine that systemd runs, it is given ten
    // seconds to appear.
    //  runtimeFolder  the login's own folder, or empty
    //  result         none when there is no user manager
    static std::unique_ptr<UserManagerStarter> connect(const std::string& runtimeFolder);

    // Done once the user manager has accepted the service; that its program cannot be run is for the manager
    // to say.
    platform::Outcome start(const LaunchAgent& agent) override;

  private:
    explicit UserManagerStarter(bus::Bus bus) : _bus(std::move(bus)) {}

    static bool _waitForUserManager(sd_bus* bus);

    const bus::Bus _bus;
};

} // namespace welcomer::launch
