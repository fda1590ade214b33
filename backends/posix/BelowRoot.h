// Opening paths as a process would whose root folder is another one: absolute links and ".." stay below it.

#pragma once

#include "backends/posix/FileDescriptor.h"

#include <string>
#include <sys/types.h>
#include <vector>

namespace welcomer::posix {

// What was found, with the folders that lead to it.
struct FoundBelowRoot {
    FileDescriptor file;            // none when nothing was found; errno then says why
    std::vector<std::string> names; // from the root to the file, without links and dots
};

// Opens a path below a root folder.
//  root   a descriptor of the root folder, opened with O_PATH or for reading
//  path   absolute, in the system that the root folder is the root of
//  flags  those of open(2); a link at the path's end is followed unless O_NOFOLLOW is among them
//  mode   of a file that is made
//  result  none when that failed; errno then says why
// The kernel does it in one call; where it cannot, the next function does. Any thread.
FileDescriptor openBelowRoot(int root, const std::string& path, int flags, mode_t mode = 0);

// The same by hand, component by component, for a kernel that does not have the call, and where the names
// are wanted, too. What others move meanwhile leads nowhere out of the root either.
FoundBelowRoot findBelowRoot(int root, const std::string& path, int flags, mode_t mode = 0);

} // namespace welcomer::posix
