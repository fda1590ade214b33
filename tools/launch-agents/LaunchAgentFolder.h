// The folder with a user's launch agents.

#pragma once

#include "tools/launch-agents/LaunchAgent.h"

#include <string>
#include <sys/types.h>
#include <vector>

namespace welcomer::launch {

// Reads every definition in a folder, in the order of the files' names. Whoever can write a definition
// decides what the user runs: a file counts only when it and the folder belong to the user and nobody else
// may write to them. A file that does not count, is no definition, or has the label of an earlier one, is
// refused with one line in the log, which names the file and the reason; so is the whole folder. A missing
// folder holds no agents.
//  owner   the user whose agents they are
// Any thread.
std::vector<LaunchAgent> readLaunchAgents(const std::string& folder, uid_t owner);

} // namespace welcomer::launch
