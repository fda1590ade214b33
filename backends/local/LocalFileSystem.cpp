#include "backends/local/LocalFileSystem.h"

#include "backends/posix/Directory.h"
#include "backends/posix/FileContent.h"
#include "backends/posix/FileDescriptor.h"
#include "backends/posix/SystemError.h"
#include "backends/posix/UnfinishedCopy.h"
#include "propertylist/UTF8.h"

#include <array>
#include <cerrno>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>
#include <utility>

namespace welcomer::local {

namespace {

constexpr std::size_t kCopyBufferSize = 65536;
constexpr mode_t kCopiedPermissions = 0777;
constexpr mode_t kNewFileMode = 0644;

int copyContent(int source, int destination) {
    std::array<char, kCopyBufferSize> buffer;
    while (true) {
        const ssize_t count = ::read(source, buffer.data(), buffer.size());
        if (count == 0) {
            return 0;
        }
        if (count < 0 && errno != EINTR) {
            return errno;
        }
        if (count < 0) {
            continue;
        }
        if (const int error =
                posix::writeAll(destination, {buffer.data(), static_cast<std::size_t>(count)})) {
            return error;
        }
    }
}

// Opens a regular file. 0, or the system's error number.
int openSource(const posix::RootFolder& root, const std::string& path, posix::FileDescriptor& file,
               mode_t& mode) {
    file = root.open(path, O_RDONLY | O_NONBLOCK); // a pipe must not block
    struct stat status = {};
    if (!file || ::fstat(file.get(), &status) != 0) {
        return errno;
    }
    if (!S_ISREG(status.st_mode)) {
        return S_ISDIR(status.st_mode) ? EISDIR : EINVAL;
    }
    mode = status.st_mode & kCopiedPermissions;
    return 0;
}

// Fills the new file and gives it its name, which must be free. 0, or the system's error number.
int finishCopy(int source, mode_t mode, int file, int folder, const std::string& temporary,
               const std::string& name) {
    if (const int error = copyContent(source, file)) {
        return error;
    }
    const bool finished = ::fchmod(file, mode) == 0 && ::fsync(file) == 0 &&
                          ::linkat(folder, temporary.c_str(), folder, name.c_str(), 0) == 0;
    return finished ? 0 : errno;
}

int copyFile(const posix::RootFolder& root, const std::string& from, const std::string& to) {
    const posix::PathParts destination = posix::splitPath(to);
    const posix::FileDescriptor folder = root.open(destination.folder, O_RDONLY | O_DIRECTORY);
    const int folderError = folder ? 0 : errno;
    struct stat present = {};
    if (folder && ::fstatat(folder.get(), destination.name.c_str(), &present, AT_SYMLINK_NOFOLLOW) == 0) {
        return EEXIST;
    }
    posix::FileDescriptor source;
    mode_t mode = 0;
    if (const int error = openSource(root, from, source, mode)) {
        return error;
    }
    if (folderError != 0) {
        return folderError;
    }
    posix::removeAbandonedCopies(folder.get());
    std::string temporary;
    const posix::FileDescriptor file = posix::makeCopy(folder.get(), temporary);
    if (!file) {
        return errno;
    }
    const int error = finishCopy(source.get(), mode, file.get(), folder.get(), temporary, destination.name);
    ::unlinkat(folder.get(), temporary.c_str(), 0);
    return error;
}

// Writes a file that is not there yet; what could not be written whole is not left behind. 0, or the system's error
// number.
int writeNewFile(const posix::RootFolder& root, const std::string& path, std::string_view content) {
    const posix::FileDescriptor file = root.open(path, O_WRONLY | O_CREAT | O_EXCL, kNewFileMode);
    if (!file) {
        return errno;
    }
    const int error = ::fchmod(file.get(), kNewFileMode) == 0 ? posix::writeAll(file.get(), content) : errno;
    if (error != 0) {
        if (const posix::FolderEntry entry = root.entry(path)) {
            ::unlinkat(entry.folder(), entry.name(), 0);
        }
    }
    return error;
}

int writeFile(const posix::RootFolder& root, const std::string& path, std::string_view content) {
    const int error = writeNewFile(root, path, content);
    if (error != EEXIST) {
        return error;
    }
    // A pipe must not block; a dangling link is not followed to make a file elsewhere.
    const posix::FileDescriptor file = root.open(path, O_WRONLY | O_TRUNC | O_NONBLOCK);
    return file ? posix::writeAll(file.get(), content) : errno;
}

int removeAll(const posix::FolderEntry& entry) {
    return entry ? posix::removeTree(entry.folder(), entry.name()) : errno;
}

} // namespace

bool LocalFileSystem::exists(const std::string& path) {
    return _root.exists(path);
}

platform::Outcome LocalFileSystem::remove(const std::string& path) {
    return posix::systemOutcome("cannot remove " + path, removeAll(_root.entry(path)));
}

platform::Outcome LocalFileSystem::createDirectory(const std::string& path, std::uint32_t mode) {
    return posix::systemOutcome("cannot create " + path, posix::makeDirectory(_root, path, mode));
}

platform::Outcome LocalFileSystem::copy(const std::string& source, const std::string& destination) {
    return posix::systemOutcome("cannot copy " + source + " to " + destination,
                                copyFile(_root, source, destination));
}

std::optional<std::vector<std::string>> LocalFileSystem::list(const std::string& path) {
    return posix::listDirectory(_root.open(_pluginFolder.located(path), O_RDONLY | O_DIRECTORY));
}

std::optional<std::string> LocalFileSystem::readText(const std::string& path) {
    std::string text;
    const bool isText = posix::readFile(_root, path, text, platform::kMaximumTextSize) == 0 &&
                        findInvalidUTF8(text) == std::string::npos;
    return isText ? std::optional(std::move(text)) : std::nullopt;
}

platform::Outcome LocalFileSystem::writeText(const std::string& path, const std::string& text) {
    return posix::systemOutcome("cannot write " + path, writeFile(_root, path, text));
}

} // namespace welcomer::local
