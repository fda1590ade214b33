// Locks between processes, which nobody but their owner can hold or have others wait for.

#pragma once

#include "backends/posix/FileDescriptor.h"
#include "backends/posix/RootFolder.h"
#include "platform/Error.h"

#include <chrono>
#include <string>

namespace welcomer::posix {

// The folder of the locks of what belongs to the machine. Those of what belongs to a user are in "Locks" in
// the library folder.
inline constexpr char kMachineLocksFolder[] = "/var/lib/welcomer/locks";
inline constexpr char kUserLocksFolderName[] = "Locks";

// The name of the lock of the files in "/var/lib/welcomer".
inline constexpr char kMachineFilesLock[] = "welcomer";

// The lock file of something in a library folder: "<library>/Locks/<name>".
std::string userLockPath(const std::string& library, const std::string& name);

// The lock file of something of the machine's: "/var/lib/welcomer/locks/<name>".
std::string machineLockPath(const std::string& name);

// A lock that is held for as long as this lives, and ends with the process at the latest. Each thing that is
// locked has a file of its own (0600), in a folder that only its owner can search (0700): what anybody may
// open, as a folder of the system, anybody may lock. The file is made where it is missing and stays; however
// the root folder is spelled, it is the same file.
class FileLock {
  public:
    // How long the other holders are waited for, unless told otherwise.
    static constexpr std::chrono::milliseconds kPatience = std::chrono::seconds(10);

    // Holds nothing.
    FileLock() = default;

    // Takes the lock, and waits for those who hold it. A second one of the same process waits, too.
    //  path  of the lock file; the folder that it is in is made where it is missing, those above are not
    FileLock(const RootFolder& root, const std::string& path, std::chrono::milliseconds patience = kPatience);

    explicit operator bool() const { return static_cast<bool>(_file); }

    // Why the lock is not held: ETIMEDOUT when others did not let go of it.
    const platform::Error& error() const { return _error; }

  private:
    FileDescriptor _file;
    platform::Error _error;
};

} // namespace welcomer::posix
