#include "backends/posix/UnfinishedCopy.h"

#include "backends/posix/Directory.h"

#include <algorithm>
#include <cerrno>
#include <fcntl.h>
#include <random>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

namespace welcomer::posix {

namespace {

constexpr std::string_view kPrefix = ".copy-";
constexpr mode_t kPrivateMode = 0600;

// Whether an open file is still the one of this name, and a regular file of this user's own.
bool isOwnAt(int file, int folder, const std::string& name) {
    struct stat opened = {};
    struct stat present = {};
    return ::fstat(file, &opened) == 0 && S_ISREG(opened.st_mode) && opened.st_uid == ::geteuid() &&
           ::fstatat(folder, name.c_str(), &present, AT_SYMLINK_NOFOLLOW) == 0 &&
           opened.st_ino == present.st_ino && opened.st_dev == present.st_dev;
}

// Takes the lock that a copy's writer has. 0, or the system's error number.
int lock(int file) {
    return ::flock(file, LOCK_EX | LOCK_NB) == 0 ? 0 : errno;
}

// Whether a new file is its maker's: until it was locked it may have passed for one that was left.
bool isKept(int file) {
    struct stat status = {};
    // Where no lock can be had at all, nobody removes anything.
    return lock(file) != EWOULDBLOCK && ::fstat(file, &status) == 0 && status.st_nlink > 0;
}

} // namespace

bool isNameOfCopy(std::string_view name) {
    const std::string_view number = name.substr(std::min(kPrefix.size(), name.size()));
    return name.starts_with(kPrefix) && !number.empty() &&
           number.find_first_not_of("0123456789") == std::string_view::npos;
}

FileDescriptor makeCopy(int folder, std::string& name) {
    std::random_device random;
    while (true) {
        name = kPrefix;
        name += std::to_string(random());
        FileDescriptor file(
            ::openat(folder, name.c_str(), O_RDWR | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, kPrivateMode));
        if (file ? isKept(file.get()) : errno != EEXIST) {
            return file;
        }
        if (file) {
            ::unlinkat(folder, name.c_str(), 0);
        }
    }
}

void removeAbandonedCopies(int folder) {
    const auto names =
        listDirectory(FileDescriptor(::openat(folder, ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC)));
    if (!names) {
        return;
    }
    for (const std::string& name : *names) {
        if (!isNameOfCopy(name)) {
            continue;
        }
        // Neither a link nor a pipe may lead or hold this process elsewhere.
        const FileDescriptor file(
            ::openat(folder, name.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY | O_CLOEXEC));
        if (file && lock(file.get()) == 0 && isOwnAt(file.get(), folder, name)) {
            ::unlinkat(folder, name.c_str(), 0);
        }
    }
}

} // namespace welcomer::posix
