// Where the example plug-ins and the example setup application's bundle lie on this machine.

#pragma once

#include <filesystem>
#include <vector>

namespace welcomer::tool {

struct ExampleFiles {
    std::filesystem::path setupBundle;
    std::vector<std::filesystem::path> plugins;
};

// Finds them beside the running program: in the installed tree, or in the tree in which it was built.
// Throws CommandFailure when they are in neither.
ExampleFiles findExampleFiles();

} // namespace welcomer::tool
