#include "backends/posix/RootFolder.h"

#include "backends/posix/BelowRoot.h"

#include <cerrno>
#include <cstdlib>
#include <memory>
#include <sys/stat.h>
#include <unistd.h>

namespace welcomer::posix {

namespace {

std::string withoutTrailingSlashes(std::string path) {
    while (path.size() > 1 && path.ends_with('/')) {
        path.pop_back();
    }
    return path;
}

} // namespace

PathParts splitPath(const std::string& path) {
    const std::string whole = withoutTrailingSlashes(path);
    const std::size_t slash = whole.rfind('/');
    return {whole.substr(0, slash + 1), whole.substr(slash + 1)};
}

RootFolder::RootFolder(std::string path) : _prefix(withoutTrailingSlashes(std::move(path))) {
    if (_prefix == "/") {
        _prefix.clear();
    }
}

FileDescriptor RootFolder::open(const std::string& path, int flags, mode_t mode) const {
    if (isWholeMachine()) {
        return FileDescriptor(::open(withoutTrailingSlashes(path).c_str(), flags | O_CLOEXEC, mode));
    }
    const FileDescriptor root = _open();
    return root ? openBelowRoot(root.get(), withoutTrailingSlashes(path), flags | O_CLOEXEC, mode)
                : FileDescriptor();
}

bool RootFolder::exists(const std::string& path) const {
    struct stat status = {};
    return isWholeMachine() ? ::stat(withoutTrailingSlashes(path).c_str(), &status) == 0
                            : static_cast<bool>(open(path, O_PATH));
}

FolderEntry RootFolder::entry(const std::string& path) const {
    if (isWholeMachine()) {
        return FolderEntry(withoutTrailingSlashes(path));
    }
    PathParts parts = splitPath(path);
    if (parts.name.empty() || parts.name == "." || parts.name == "..") {
        errno = EINVAL; // no entry of a folder below the root
        return {FileDescriptor(), {}};
    }
    return {open(parts.folder, O_PATH | O_DIRECTORY), std::move(parts.name)};
}

std::optional<std::string> RootFolder::resolve(const std::string& path) const {
    if (isWholeMachine()) {
        const std::unique_ptr<char, void (*)(void*)> result(::realpath(path.c_str(), nullptr), ::free);
        return result ? std::optional<std::string>(result.get()) : std::nullopt;
    }
    const FileDescriptor root = _open();
    if (!root) {
        return std::nullopt;
    }
    const FoundBelowRoot found = findBelowRoot(root.get(), path, O_PATH | O_CLOEXEC);
    if (!found.file) {
        return std::nullopt;
    }
    std::string resolved = _prefix;
    for (const std::string& name : found.names) {
        resolved += "/" + name;
    }
    return resolved;
}

std::string RootFolder::shown(const std::string& path) const {
    return withoutTrailingSlashes(_prefix + path);
}

FileDescriptor RootFolder::_open() const {
    return FileDescriptor(::open(_prefix.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
}

} // namespace welcomer::posix
