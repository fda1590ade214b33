// One launch agent as its property list defines it.

#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace welcomer::launch {

struct LaunchAgent {
    std::string label;                  // not empty
    std::string program;                // the full path of what is run
    std::vector<std::string> arguments; // with the program's own name first, as argv has it
    bool runAtLoad = false;             // whether it is started at the login
    std::string file = {};              // the name of the file that it was read from, and
    std::string content = {};           // what is in it; both empty where it was not read from a file

    friend bool operator==(const LaunchAgent&, const LaunchAgent&) = default;
};

// The agent that was read, or why there is none.
struct LaunchAgentResult {
    std::optional<LaunchAgent> agent;
    std::string error; // one line; empty on success
};

// Reads a definition: a dictionary with "Label", "Program" or "ProgramArguments" or both, and "RunAtLoad".
// With no "Program" the first of the arguments is the program, with no "ProgramArguments" the program is the
// only argument. What else the dictionary holds is not looked at.
//  bytes   the property list, in any of its formats
// Any thread.
LaunchAgentResult readLaunchAgent(std::string_view bytes);

} // namespace welcomer::launch
