// Starting a user's launch agents at a login.

#pragma once

#include "tools/launch-agents/AgentStarter.h"
#include "tools/launch-agents/LoginStamp.h"

#include <functional>
#include <memory>
#include <string>
#include <sys/types.h>
#include <vector>

namespace welcomer::launch {

// What was started, and by whom; without a starter where nothing was to be started.
struct StartedAgents {
    std::unique_ptr<AgentStarter> starter;
    std::vector<LaunchAgent> agents;
};

// Starts each agent of the folder that is to run at the login, unless that was done in this login already;
// where that cannot be told, it starts them. An agent that cannot be started costs one line in the log and
// nothing else.
//  folder       where the definitions are
//  owner        the user whose agents they are
//  stamp        what tells whether it was done already
//  makeStarter  makes what starts the agents; called once and only when there is an agent to start
//  result       those that were started
// Main thread.
StartedAgents startLaunchAgents(const std::string& folder, uid_t owner, const LoginStamp& stamp,
                                const std::function<std::unique_ptr<AgentStarter>()>& makeStarter);

} // namespace welcomer::launch
