// Who may change what code of this process has come from.

#pragma once

#include "tools/welcomer/checks/Finding.h"

#include <string>
#include <vector>

namespace welcomer::tool {

// Everything that code of this process has come from.
std::vector<std::string> loadedFiles();

// Looks at the files that this program and what it has loaded have come from. Main thread.
Finding checkLoadedCode();

} // namespace welcomer::tool
