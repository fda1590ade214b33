// What an agent has written to the journal.

#pragma once

#include "tools/launch-agents/AgentStarter.h"

#include <chrono>
#include <string>
#include <vector>

namespace welcomer::launch {

// The lines of one run of an agent, in order. They are found by the process that the kernel says has sent them: the
// journal asks for a sender's unit only later, when one that ends right after its last line may be gone. Lines that it
// does know the unit's invocation of, and another one, are not the agent's.
//  program   the name that the program logs under
//  last      the line that the agent ends with: until it has come, there may be more
//  patience  how long to wait for that line
//  result    what there is by then; nothing where there is no journal that this user may read
// Any thread; does not block when the last line is there.
std::vector<std::string> readAgentLines(const AgentRun& run, const std::string& program,
                                        const std::string& last, std::chrono::microseconds patience);

} // namespace welcomer::launch
