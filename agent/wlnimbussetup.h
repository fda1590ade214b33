// The post-login agent from its start to its end.

#pragma once

#include "platform/DispatchQueue.h"

#include <chrono>

namespace welcomer {

// The agent's last log line.
inline constexpr char kAgentExitingMessage[] = "exiting";

// Runs the agent on the installed platform, as the logged-in user: removes its launch-agent file, reads and
// deletes the replay item, carries out the setup stages, waits for their work and lingers for two minutes.
// Without a readable replay item it ends at once. Nothing throws out of it.
//  argc, argv  as main has them; the first argument is the launch agent's label, further ones are ignored
//  result      the exit status, always 0
// Main thread. Plug-in threads may still be running when this returns: the process is to be left at once
// (agent/leaveProcess.h).
int wlnimbussetup(int argc, const char* const* argv);

// The last two steps of it, for who has a stage carried out alone. On the thread whose run loop the plug-ins use.

// Waits until the group is empty, without a limit. The run loop is run meanwhile, in slices.
void waitForDelegates(platform::WorkGroup& group);

// Runs the run loop for a while, for what plug-ins have started outside the group.
void linger(std::chrono::nanoseconds duration);

} // namespace welcomer
