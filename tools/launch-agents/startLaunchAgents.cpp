#include "tools/launch-agents/startLaunchAgents.h"

#include "log/PCLogManager.h"
#include "tools/launch-agents/LaunchAgentFolder.h"

#include <utility>

namespace welcomer::launch {

StartedAgents startLaunchAgents(const std::string& folder, uid_t owner, const LoginStamp& stamp,
                                const std::function<std::unique_ptr<AgentStarter>()>& makeStarter) {
    StartedAgents started;
    if (stamp.set() == LoginStamp::Result::WasThere) {
        return started;
    }
    for (LaunchAgent& agent : readLaunchAgents(folder, owner)) {
        if (!agent.runAtLoad) {
            continue;
        }
        if (!started.starter) {
            started.starter = makeStarter();
        }
        if (const platform::Outcome outcome = started.starter->start(agent); !outcome) {
            WL_LOG("Failed to start launch agent %@: %@", agent.label, outcome.error);
        } else {
            started.agents.push_back(std::move(agent));
        }
    }
    return started;
}

} // namespace welcomer::launch
