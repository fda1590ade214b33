// Where plug-ins come from, whom they belong to, and whether they load.

#pragma once

#include "tools/welcomer/checks/Finding.h"
#include "tools/welcomer/cli/Tool.h"

namespace welcomer::tool {

// Loads the plug-ins, in a process of their own.
//  folder  the one that serves
// Main thread.
Findings checkPlugins(const Options& options, const std::string& folder);

} // namespace welcomer::tool
