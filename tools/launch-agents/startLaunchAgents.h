// Starting a user's launch agents at a login.

#pragma once

#include "tools/launch-agents/AgentStarter.h"
#include "tools/launch-agents/LoginStamp.h"

#include <functional>
#include <memory>
#include <string>
#include <sys/types.h>

namespace welcomer::launch {

// Starts each agent of the folder that is to run at the login, unless that was done in this login already;
// where that cannot be told, it starts them. An agent that cannot be started costs one line in the log and
// nothing else.
//  folder       where the definitions are
//  owner        the user whose agents they are
//  stamp        what tells whether it was done already
//  makeStarter  makes what starts the agents; called once and only when there is an agent to start
// Main thread.
void startLaunchAgents(const std::string& folder, uid_t owner, const LoginStamp& stamp,
                       const std::function<std::unique_ptr<AgentStarter>()>& makeStarter);

} // namespace welcomer::launch
