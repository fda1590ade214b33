// What comes with the tool, beside the running program in the installed tree or in the tree in which it was
// built. Each function that finds a bundle gives its folder; empty when it is in neither.

#pragma once

#include <filesystem>
#include <string>
#include <vector>

namespace welcomer::tool {

// Where what comes with the tool lies.
struct ToolFolders {
    std::filesystem::path data;     // the bundles
    std::filesystem::path examples; // the example plug-ins, in "plugins"
    std::filesystem::path services; // the programs that people do not start themselves
};

// Where to look, in this order; empty when the system does not say where the program is.
std::vector<ToolFolders> toolFolders();

// The tool's own: the texts that it has as an application.
std::string findToolBundle();

// The setup application's: the agent and its launch-agent file.
std::string findSetupBundle();

} // namespace welcomer::tool
