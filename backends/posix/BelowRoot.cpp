#include "backends/posix/BelowRoot.h"

#include <array>
#include <cerrno>
#include <climits>
#include <deque>
#include <fcntl.h>
#include <linux/openat2.h>
#include <optional>
#include <string_view>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>
#include <utility>

namespace welcomer::posix {

namespace {

constexpr int kMostLinks = 40; // as many as the kernel follows
constexpr int kMostAttempts = 8;

using Names = std::deque<std::string>;

// Puts the components of a path before those that are left.
void prepend(std::string_view path, Names& left) {
    Names components;
    while (!path.empty()) {
        const std::string_view name = path.substr(0, path.find('/'));
        if (!name.empty() && name != ".") {
            components.emplace_back(name);
        }
        path.remove_prefix(name.size() == path.size() ? name.size() : name.size() + 1);
    }
    left.insert(left.begin(), components.begin(), components.end());
}

// The text of a link that was opened itself; none when it cannot be read.
std::optional<std::string> linkText(int link) {
    std::array<char, PATH_MAX> text{};
    const ssize_t length = ::readlinkat(link, "", text.data(), text.size());
    if (length < 0) {
        return std::nullopt;
    }
    return std::string(text.data(), static_cast<std::size_t>(length));
}

// One walk from the root to what a path names.
class Walk {
  public:
    Walk(int root, const std::string& path) : _root(root) { prepend(path, _left); }

    FileDescriptor go(int flags, mode_t mode) {
        while (!_left.empty()) {
            const std::string name = std::move(_left.front());
            _left.pop_front();
            if (name == "..") {
                _goUp();
                continue;
            }
            FileDescriptor file(::openat(_here(), name.c_str(), O_PATH | O_NOFOLLOW | O_CLOEXEC));
            if (!file) {
                // Only what is last may be made.
                return errno == ENOENT && (flags & O_CREAT) != 0 && _left.empty() ? _end(name, flags, mode)
                                                                                  : FileDescriptor();
            }
            struct stat status = {};
            if (::fstat(file.get(), &status) != 0) {
                return FileDescriptor();
            }
            if (S_ISLNK(status.st_mode) && !(_left.empty() && isNotFollowed(flags))) {
                if (!_follow(file.get())) {
                    return FileDescriptor();
                }
                continue;
            }
            if (_left.empty()) {
                return _end(name, flags, mode);
            }
            if (!S_ISDIR(status.st_mode)) {
                errno = ENOTDIR;
                return FileDescriptor();
            }
            _folders.push_back(std::move(file));
            _names.push_back(name);
        }
        return FileDescriptor(::openat(_here(), ".", flags & ~(O_CREAT | O_EXCL), mode));
    }

    std::vector<std::string> takeNames() { return std::move(_names); }

  private:
    // What is to be made anew follows no link either.
    static bool isNotFollowed(int flags) {
        return (flags & O_NOFOLLOW) != 0 || ((flags & O_CREAT) != 0 && (flags & O_EXCL) != 0);
    }

    int _here() const { return _folders.empty() ? _root : _folders.back().get(); }

    // Nothing is above the root.
    void _goUp() {
        if (!_folders.empty()) {
            _folders.pop_back();
            _names.pop_back();
        }
    }

    bool _follow(int link) {
        if (++_links > kMostLinks) {
            errno = ELOOP;
            return false;
        }
        const std::optional<std::string> text = linkText(link);
        if (!text) {
            return false;
        }
        if (text->starts_with('/')) {
            _folders.clear();
            _names.clear();
        }
        prepend(*text, _left);
        return true;
    }

    FileDescriptor _end(const std::string& name, int flags, mode_t mode) {
        _names.push_back(name);
        return FileDescriptor(::openat(_here(), name.c_str(), flags | O_NOFOLLOW, mode));
    }

    const int _root;
    Names _left;
    std::vector<FileDescriptor> _folders; // from below the root to where the walk is
    std::vector<std::string> _names;      // theirs
    int _links = 0;
};

} // namespace

FileDescriptor openBelowRoot(int root, const std::string& path, int flags, mode_t mode) {
    open_how how = {};
    how.flags = static_cast<std::uint64_t>(flags) | O_LARGEFILE;
    how.mode = (flags & O_CREAT) != 0 ? mode : 0; // the call refuses a mode that means nothing
    how.resolve = RESOLVE_IN_ROOT;
    int error = EAGAIN;
    // Another program that moves folders meanwhile makes the kernel unsure.
    for (int attempt = 0; error == EAGAIN && attempt < kMostAttempts; ++attempt) {
        FileDescriptor file(static_cast<int>(::syscall(SYS_openat2, root, path.c_str(), &how, sizeof how)));
        if (file) {
            return file;
        }
        error = errno;
    }
    // EPERM is also what a filter of system calls says in place of what it does not know.
    if (error == ENOSYS || error == EPERM || error == EAGAIN) {
        return findBelowRoot(root, path, flags, mode).file;
    }
    errno = error;
    return FileDescriptor();
}

FoundBelowRoot findBelowRoot(int root, const std::string& path, int flags, mode_t mode) {
    Walk walk(root, path);
    FileDescriptor file = walk.go(flags, mode);
    const int error = errno;
    FoundBelowRoot found{std::move(file), walk.takeNames()};
    errno = error; // closing the folders has not changed it
    return found;
}

} // namespace welcomer::posix
