// Making folders.

#pragma once

#include <string>
#include <sys/types.h>

namespace welcomer::local {

// Makes one folder with exactly this mode, whatever the process's mask. The path is one of this machine.
//  result  0, or the system's error number; nothing is left behind then
// Any thread.
int makeDirectory(const std::string& path, mode_t mode);

} // namespace welcomer::local
