// Replacing a file in one step: whoever reads it meets the old content or the new, also after a crash.

#pragma once

#include <string>
#include <string_view>
#include <sys/types.h>

namespace welcomer::posix {

// What is certain when a file has been replaced: that the new content is still there after a crash, for which
// the folder is synced too, or that the old or the new one is.
enum class AfterCrash { New, OldOrNew };

// Replaces a file: writes a temporary file in the same folder, syncs it and renames it. A file that is a
// mount point of its own cannot be renamed over; it is rewritten in place once its space is reserved, and
// then a crash may leave it damaged.
//  folder   a descriptor of the folder; the caller holds the lock of the file (FileLock.h)
//  name     the file's name in it
//  content  the new content, any bytes
//  mode     the permissions of the new file, whatever the process's mask; a mount point keeps its own. The
//           group stays, where this process may give a file to it: whoever could read it still can
//  result   0, or the system's error number; the file is then unchanged and nothing is left beside it
// Any thread.
int replaceFile(int folder, const std::string& name, std::string_view content, mode_t mode,
                AfterCrash afterCrash = AfterCrash::New);

// Makes a file that is not there yet: all of it appears at once.
//  result  0, or the system's error number, EEXIST when something has the name; nothing is left behind then
// The rest is as above. Any thread.
int createFile(int folder, const std::string& name, std::string_view content, mode_t mode);

// Removes what a writer that was killed left beside a file. The caller holds the file's lock. Any thread.
void removeLeftOver(int folder, const std::string& name);

} // namespace welcomer::posix
