// Making, listing and removing folders.

#pragma once

#include "backends/posix/RootFolder.h"

#include <optional>
#include <string>
#include <sys/types.h>
#include <vector>

namespace welcomer::posix {

// Makes one folder with exactly this mode, whatever the process's mask.
//  result  0, or the system's error number; nothing is left behind then
// Any thread.
int makeDirectory(const RootFolder& root, const std::string& path, mode_t mode);

// The same for a folder and those above it, as far as they are missing. What cannot be made shows when it is
// used. Any thread.
void makeDirectories(const RootFolder& root, const std::string& path, mode_t mode);

// The names of a folder's entries without "." and "..", in the file system's own order; none when it cannot
// be read. Any thread.
std::optional<std::vector<std::string>> listDirectory(FileDescriptor folder);

// Removes an entry and, when it is a folder, all that is in it; links in it are not followed.
//  folder, name  as for unlinkat(2)
//  result        0, or the system's error number; something may have been removed then
// Any thread.
int removeTree(int folder, const char* name);

} // namespace welcomer::posix
