// A file that is being copied, under a name of its own until it is whole.

#pragma once

#include "backends/posix/FileDescriptor.h"

#include <string>
#include <string_view>

namespace welcomer::posix {

// Whether a file has a name as makeCopy() gives it.
bool isNameOfCopy(std::string_view name);

// Makes a file under such a name that is free, for the user alone. It is locked, which tells it from one that a killed
// process has left.
//  folder  an open folder
//  name    receives its name
//  result  none when that failed; errno then says why
FileDescriptor makeCopy(int folder, std::string& name);

// Removes the user's own copies in a folder that nobody is writing any more. What cannot be removed stays. Any thread.
//  folder  an open folder
void removeAbandonedCopies(int folder);

} // namespace welcomer::posix
