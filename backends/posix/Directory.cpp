#include "backends/posix/Directory.h"

#include <cerrno>
#include <dirent.h>
#include <fcntl.h>
#include <memory>
#include <sys/stat.h>
#include <unistd.h>

namespace welcomer::posix {

int makeDirectory(const RootFolder& root, const std::string& path, mode_t mode) {
    const FolderEntry entry = root.entry(path);
    if (!entry || ::mkdirat(entry.folder(), entry.name(), mode) != 0) {
        return errno;
    }
    if (::fchmodat(entry.folder(), entry.name(), mode, 0) != 0) {
        const int error = errno;
        ::unlinkat(entry.folder(), entry.name(), AT_REMOVEDIR);
        return error;
    }
    return 0;
}

void makeDirectories(const RootFolder& root, const std::string& path, mode_t mode) {
    for (std::size_t slash = path.find('/', 1); slash != std::string::npos;
         slash = path.find('/', slash + 1)) {
        makeDirectory(root, path.substr(0, slash), mode); // most are there
    }
    makeDirectory(root, path, mode);
}

std::optional<std::vector<std::string>> listDirectory(FileDescriptor folder) {
    const std::unique_ptr<DIR, int (*)(DIR*)> stream(folder ? ::fdopendir(folder.get()) : nullptr,
                                                     ::closedir);
    if (!stream) {
        return std::nullopt;
    }
    folder.release(); // the stream's from now on
    std::vector<std::string> names;
    errno = 0;
    while (const dirent* entry = ::readdir(stream.get())) {
        std::string name = static_cast<const char*>(entry->d_name);
        if (name != "." && name != "..") {
            names.push_back(std::move(name));
        }
        errno = 0;
    }
    if (errno != 0) {
        return std::nullopt;
    }
    return names;
}

int removeTree(int folder, const char* name) {
    if (::unlinkat(folder, name, 0) == 0) {
        return 0;
    }
    if (errno != EISDIR) {
        return errno;
    }
    const FileDescriptor inner(::openat(folder, name, O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
    const auto names =
        inner ? listDirectory(FileDescriptor(::fcntl(inner.get(), F_DUPFD_CLOEXEC, 0))) : std::nullopt;
    if (!names) {
        return errno;
    }
    for (const std::string& each : *names) {
        const int error = removeTree(inner.get(), each.c_str());
        if (error != 0 && error != ENOENT) { // another process may remove, too
            return error;
        }
    }
    return ::unlinkat(folder, name, AT_REMOVEDIR) == 0 ? 0 : errno;
}

} // namespace welcomer::posix
