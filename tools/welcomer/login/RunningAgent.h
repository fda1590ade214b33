// Whether an agent runs.

#pragma once

#include <cstdint>
#include <string>

namespace welcomer::tool {

// Whether a process of the user's is the agent.
//  root  the folder below which the processes are looked up
// Any thread.
bool agentRuns(const std::string& root, std::uint32_t userID);

} // namespace welcomer::tool
