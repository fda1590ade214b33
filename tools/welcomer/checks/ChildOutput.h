// What another program has to say, for a bounded time.

#pragma once

#include <chrono>
#include <string>
#include <vector>

namespace welcomer::tool {

struct ChildOutput {
    std::string text;    // its standard output; no more than it may write
    std::string trouble; // why that is not all of it, or not to be trusted; one line, empty when it is
};

// Runs a program and takes what it writes to its standard output; its standard error and input lead nowhere. One
// that takes too long, or writes more than 4 MiB, is killed.
//  command  the program's path or name, and its arguments
// Main thread.
ChildOutput outputOf(const std::vector<std::string>& command, std::chrono::milliseconds limit);

} // namespace welcomer::tool
