// Who may change what code is loaded from.

#pragma once

#include "tools/welcomer/checks/Finding.h"

#include <string>
#include <vector>

namespace welcomer::tool {

// Whether somebody whom the user need not trust may change a file or a folder, or put another one in its place: the
// superuser may, and whoever the root folder belongs to. What is missing is passed over.
//  root      the root folder, absolute
//  path      absolute, below that; links are followed
//  mayBeOwn  whether what belongs to the user who asks is as good, since nobody else loads it
//  result    who may, in one line; empty when nobody may
std::string strangerWhoMayChange(const std::string& root, const std::string& path, bool mayBeOwn);

// Everything that code of this process has come from.
std::vector<std::string> loadedFiles();

// Looks at the files that this program and what it has loaded have come from. Main thread.
Finding checkLoadedCode();

} // namespace welcomer::tool
