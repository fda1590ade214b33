#include "backends/posix/AtomicFile.h"

#include "backends/posix/FileContent.h"
#include "backends/posix/FileDescriptor.h"

#include <cerrno>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

namespace welcomer::posix {

namespace {

// One name for all writers: they hold the lock, and so the next one meets and replaces what is left over.
std::string temporaryName(const std::string& name) {
    return "." + name + ".new";
}

// Whether a file has this group now, as far as this process may give it away.
bool giveToGroup(int file, gid_t group) {
    return group == ::getegid() || ::fchown(file, static_cast<uid_t>(-1), group) == 0 || errno == EPERM ||
           errno == EINVAL;
}

int writeNewFile(int folder, const std::string& name, std::string_view content, mode_t mode, gid_t group) {
    const FileDescriptor file(
        ::openat(folder, name.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, mode));
    if (!file || !giveToGroup(file.get(), group) || ::fchmod(file.get(), mode) != 0) {
        return errno;
    }
    if (const int error = writeAll(file.get(), content)) {
        return error;
    }
    return ::fsync(file.get()) == 0 ? 0 : errno;
}

// Has an open file hold this content and no more.
int overwrite(int file, std::string_view content) {
    if (::lseek(file, 0, SEEK_SET) < 0) {
        return errno;
    }
    if (const int error = writeAll(file, content)) {
        return error;
    }
    return ::ftruncate(file, static_cast<off_t>(content.size())) == 0 && ::fsync(file) == 0 ? 0 : errno;
}

int rewriteInPlace(int folder, const std::string& name, std::string_view content) {
    const FileDescriptor file(::openat(folder, name.c_str(), O_RDWR | O_NOFOLLOW | O_CLOEXEC));
    struct stat status = {};
    if (!file || ::fstat(file.get(), &status) != 0) {
        return errno;
    }
    std::string before;
    if (const int error = readAll(file.get(), before, static_cast<std::size_t>(status.st_size))) {
        return error;
    }
    const auto size = static_cast<off_t>(content.size());
    if (const int error = size > status.st_size ? ::posix_fallocate(file.get(), 0, size) : 0) {
        return ::ftruncate(file.get(), status.st_size) == 0 ? error : errno;
    }
    const int error = overwrite(file.get(), content);
    if (error != 0) {
        overwrite(file.get(), before); // its space is there
    }
    return error;
}

} // namespace

int replaceFile(int folder, const std::string& name, std::string_view content, mode_t mode,
                AfterCrash afterCrash) {
    removeLeftOver(folder, name);
    const std::string temporary = temporaryName(name);
    struct stat present = {};
    const bool isPresent = ::fstatat(folder, name.c_str(), &present, AT_SYMLINK_NOFOLLOW) == 0;
    int error = writeNewFile(folder, temporary, content, mode, isPresent ? present.st_gid : ::getegid());
    if (error == 0 && ::renameat(folder, temporary.c_str(), folder, name.c_str()) != 0) {
        error = errno == EBUSY ? rewriteInPlace(folder, name, content) : errno;
        removeLeftOver(folder, name);
        return error;
    }
    if (error != 0) {
        removeLeftOver(folder, name);
        return error;
    }
    if (afterCrash == AfterCrash::New) {
        // The file is in place already: a folder that cannot be synced takes nothing back.
        ::fsync(folder);
    }
    return 0;
}

int createFile(int folder, const std::string& name, std::string_view content, mode_t mode) {
    removeLeftOver(folder, name);
    const std::string temporary = temporaryName(name);
    int error = writeNewFile(folder, temporary, content, mode, ::getegid());
    if (error == 0 && ::linkat(folder, temporary.c_str(), folder, name.c_str(), 0) != 0) {
        error = errno;
    }
    removeLeftOver(folder, name);
    if (error == 0) {
        ::fsync(folder);
    }
    return error;
}

void removeLeftOver(int folder, const std::string& name) {
    ::unlinkat(folder, temporaryName(name).c_str(), 0);
}

} // namespace welcomer::posix
