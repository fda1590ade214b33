#include "backends/posix/FileLock.h"

#include "backends/posix/Directory.h"
#include "backends/posix/SystemError.h"
#include "platform/Path.h"

#include <algorithm>
#include <cerrno>
#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <thread>
#include <unistd.h>

namespace welcomer::posix {

namespace {

using std::chrono::milliseconds;
using Clock = std::chrono::steady_clock;

constexpr mode_t kFolderMode = 0700;
constexpr mode_t kFileMode = 0600;
constexpr mode_t kPermissions = 07777;

constexpr milliseconds kShortestPause{1};
constexpr milliseconds kLongestPause{32};

// Gives something of this user's own exactly this mode, whatever the process's mask was when it was made. 0,
// or the system's error number; EPERM for what is not the user's own.
int makePrivate(int file, mode_t mode) {
    struct stat status = {};
    if (::fstat(file, &status) != 0) {
        return errno;
    }
    if (status.st_uid != ::geteuid()) {
        return EPERM;
    }
    return (status.st_mode & kPermissions) == mode || ::fchmod(file, mode) == 0 ? 0 : errno;
}

// Opens the folder of the locks, which is made where it is missing. 0, or the system's error number.
int openFolder(const RootFolder& root, const std::string& path, FileDescriptor& folder) {
    const int flags = O_RDONLY | O_DIRECTORY | O_NOFOLLOW;
    folder = root.open(path, flags);
    if (!folder && errno == ENOENT) {
        const int error = makeDirectory(root, path, kFolderMode);
        if (error != 0 && error != EEXIST) { // another process may make it at the same time
            return error;
        }
        folder = root.open(path, flags);
    }
    return folder ? makePrivate(folder.get(), kFolderMode) : errno;
}

// A pipe in the file's place must not block. 0, or the system's error number.
int openFile(int folder, const char* name, FileDescriptor& file) {
    file = FileDescriptor(
        ::openat(folder, name, O_RDWR | O_CREAT | O_NOFOLLOW | O_CLOEXEC | O_NONBLOCK, kFileMode));
    return file ? makePrivate(file.get(), kFileMode) : errno;
}

// 0, or the system's error number; ETIMEDOUT when the time is up. No call of the system waits for a lock
// until a given time without a signal, which is not ours to use.
int waitForLock(int file, milliseconds patience) {
    const Clock::time_point end = Clock::now() + patience;
    milliseconds pause = kShortestPause;
    while (::flock(file, LOCK_EX | LOCK_NB) != 0) {
        if (errno != EWOULDBLOCK && errno != EINTR) {
            return errno;
        }
        const auto left = std::chrono::ceil<milliseconds>(end - Clock::now());
        if (left <= milliseconds::zero()) {
            return ETIMEDOUT;
        }
        std::this_thread::sleep_for(std::min(pause, left));
        pause = std::min(2 * pause, kLongestPause);
    }
    return 0;
}

std::string secondsText(milliseconds patience) {
    const auto seconds = std::chrono::duration_cast<std::chrono::seconds>(patience).count();
    return std::to_string(seconds) + (seconds == 1 ? " second" : " seconds");
}

} // namespace

std::string userLockPath(const std::string& library, const std::string& name) {
    return platform::joinPath(platform::joinPath(library, kUserLocksFolderName), name);
}

std::string machineLockPath(const std::string& name) {
    return platform::joinPath(kMachineLocksFolder, name);
}

FileLock::FileLock(const RootFolder& root, const std::string& path, milliseconds patience) {
    const std::size_t slash = path.rfind('/');
    FileDescriptor folder;
    if (const int error = openFolder(root, path.substr(0, slash), folder)) {
        _error =
            systemError("cannot use the folder of the locks, " + root.shown(path.substr(0, slash)), error);
        return;
    }
    FileDescriptor file;
    int error = openFile(folder.get(), path.c_str() + slash + 1, file);
    if (error == 0) {
        error = waitForLock(file.get(), patience);
    }
    if (error == ETIMEDOUT) {
        _error = {error, root.shown(path) + " is locked by another process: waited " + secondsText(patience)};
    } else if (error != 0) {
        _error = systemError("cannot lock " + root.shown(path), error);
    } else {
        _file = std::move(file);
    }
}

} // namespace welcomer::posix
