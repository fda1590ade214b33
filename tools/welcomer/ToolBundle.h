// The tool's own bundle: the texts that it has as an application.

#pragma once

#include <string>

namespace welcomer::tool {

// The bundle's folder, beside the running program in the installed tree or in the tree in which it was built;
// empty when it is in neither.
std::string findToolBundle();

} // namespace welcomer::tool
