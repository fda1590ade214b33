// Who may change what code is loaded from.

#pragma once

#include "backends/posix/RootFolder.h"

#include <string>

namespace welcomer::posix {

// Whether somebody whom the user need not trust may change a file or a folder, or put another one in its place. The
// superuser may, and whoever the root folder belongs to; so may their groups: the superuser's, and the root folder's
// where that may write the root folder itself. What is missing is passed over.
//  path      absolute, below the root; links are followed
//  mayBeOwn  whether what belongs to the user who asks is as good, since nobody else loads it
//  result    who may, in one line; empty when nobody may
// Any thread.
std::string strangerWhoMayChange(const RootFolder& root, const std::string& path, bool mayBeOwn);

} // namespace welcomer::posix
