// The bundles that come with the tool, beside the running program in the installed tree or in the tree in
// which it was built. Each function gives the bundle's folder; empty when it is in neither.

#pragma once

#include <string>

namespace welcomer::tool {

// The tool's own: the texts that it has as an application.
std::string findToolBundle();

// The setup application's: the agent and its launch-agent file.
std::string findSetupBundle();

} // namespace welcomer::tool
