#include "backends/local/LocalFileSystem.h"

#include "backends/local/Directory.h"
#include "backends/local/FileContent.h"
#include "backends/local/FileDescriptor.h"
#include "backends/local/SystemError.h"
#include "propertylist/UTF8.h"

#include <array>
#include <cerrno>
#include <cstdlib>
#include <dirent.h>
#include <fcntl.h>
#include <filesystem>
#include <memory>
#include <sys/stat.h>
#include <system_error>
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
        if (const int error = writeAll(destination, {buffer.data(), static_cast<std::size_t>(count)})) {
            return error;
        }
    }
}

// Opens a regular file. 0, or the system's error number.
int openSource(const std::string& path, FileDescriptor& file, mode_t& mode) {
    // A pipe must not block.
    file = FileDescriptor(::open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK));
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
int finishCopy(int source, mode_t mode, int file, const std::string& temporary, const std::string& path) {
    if (const int error = copyContent(source, file)) {
        return error;
    }
    const bool finished =
        ::fchmod(file, mode) == 0 && ::fsync(file) == 0 && ::link(temporary.c_str(), path.c_str()) == 0;
    return finished ? 0 : errno;
}

int copyFile(const std::string& from, const std::string& to) {
    struct stat present = {};
    if (::lstat(to.c_str(), &present) == 0) {
        return EEXIST;
    }
    FileDescriptor source;
    mode_t mode = 0;
    if (const int error = openSource(from, source, mode)) {
        return error;
    }
    std::string temporary = to.substr(0, to.rfind('/') + 1) + ".copy-XXXXXX";
    const FileDescriptor file(::mkostemp(temporary.data(), O_CLOEXEC));
    if (!file) {
        return errno;
    }
    const int error = finishCopy(source.get(), mode, file.get(), temporary, to);
    ::unlink(temporary.c_str());
    return error;
}

// Removes whatever is at the path. 0, or the system's error number.
int removeAll(const std::string& path) {
    if (::unlink(path.c_str()) == 0) {
        return 0;
    }
    if (errno != EISDIR) {
        return errno;
    }
    std::error_code error;
    const bool removed = std::filesystem::remove_all(path, error) > 0;
    return removed || error ? error.value() : ENOENT;
}

// Opens a file to be written from its start, making it where it is missing. 0, or the system's error number.
int openToWrite(const std::string& path, FileDescriptor& file) {
    file = FileDescriptor(::open(path.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, kNewFileMode));
    if (file) {
        return ::fchmod(file.get(), kNewFileMode) == 0 ? 0 : errno;
    }
    if (errno == EEXIST) {
        // A pipe must not block; a dangling link is not followed to make a file elsewhere.
        file = FileDescriptor(::open(path.c_str(), O_WRONLY | O_TRUNC | O_CLOEXEC | O_NONBLOCK));
    }
    return file ? 0 : errno;
}

int writeFile(const std::string& path, std::string_view content) {
    FileDescriptor file;
    const int error = openToWrite(path, file);
    return error == 0 ? writeAll(file.get(), content) : error;
}

} // namespace

bool LocalFileSystem::exists(const std::string& path) {
    struct stat status = {};
    return ::stat(_root.locate(path).c_str(), &status) == 0;
}

platform::Outcome LocalFileSystem::remove(const std::string& path) {
    return systemOutcome("cannot remove " + path, removeAll(_root.locate(path)));
}

platform::Outcome LocalFileSystem::createDirectory(const std::string& path, std::uint32_t mode) {
    return systemOutcome("cannot create " + path, makeDirectory(_root.locate(path), mode));
}

platform::Outcome LocalFileSystem::copy(const std::string& source, const std::string& destination) {
    return systemOutcome("cannot copy " + source + " to " + destination,
                         copyFile(_root.locate(source), _root.locate(destination)));
}

std::optional<std::vector<std::string>> LocalFileSystem::list(const std::string& path) {
    const std::unique_ptr<DIR, int (*)(DIR*)> folder(::opendir(_root.locate(path).c_str()), ::closedir);
    if (!folder) {
        return std::nullopt;
    }
    std::vector<std::string> names;
    errno = 0;
    while (const dirent* entry = ::readdir(folder.get())) {
        const std::string name = static_cast<const char*>(entry->d_name);
        if (name != "." && name != "..") {
            names.push_back(name);
        }
        errno = 0;
    }
    if (errno != 0) {
        return std::nullopt;
    }
    return names;
}

std::optional<std::string> LocalFileSystem::readText(const std::string& path) {
    std::string text;
    const bool isText = readFile(_root.locate(path), text, platform::kMaximumTextSize) == 0 &&
                        findInvalidUTF8(text) == std::string::npos;
    return isText ? std::optional(std::move(text)) : std::nullopt;
}

platform::Outcome LocalFileSystem::writeText(const std::string& path, const std::string& text) {
    return systemOutcome("cannot write " + path, writeFile(_root.locate(path), text));
}

} // namespace welcomer::local
