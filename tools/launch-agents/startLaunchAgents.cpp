#include "tools/launch-agents/startLaunchAgents.h"

#include "log/PCLogManager.h"
#include "tools/launch-agents/LaunchAgentFolder.h"

namespace welcomer::launch {

void startLaunchAgents(const std::string& folder, uid_t owner, const LoginStamp& stamp,
                       const std::function<std::unique_ptr<AgentStarter>()>& makeStarter) {
    if (stamp.set() == LoginStamp::Result::WasThere) {
        return;
    }
    std::unique_ptr<AgentStarter> starter;
    for (const LaunchAgent& agent : readLaunchAgents(folder, owner)) {
        if (!agent.runAtLoad) {
            continue;
        }
        if (!starter) {
            starter = makeStarter();
        }
        if (const platform::Outcome started = starter->start(agent); !started) {
            WL_LOG("Failed to start launch agent %@: %@", agent.label, started.error);
        }
    }
}

} // namespace welcomer::launch
