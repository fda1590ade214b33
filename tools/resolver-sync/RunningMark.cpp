#include "tools/resolver-sync/RunningMark.h"

#include <array>
#include <cerrno>
#include <fcntl.h>
#include <sys/stat.h>
#include <system_error>
#include <unistd.h>

namespace welcomer::resolver {

namespace {

// Of the file description: it ends with it, however the process ends, and children do not inherit it.
struct flock wholeFile(short type) {
    struct flock lock {};
    lock.l_type = type;
    lock.l_whence = SEEK_SET;
    return lock;
}

int openLocked(const std::string& path) {
    const int file = ::open(path.c_str(), O_RDWR | O_CREAT | O_NOFOLLOW | O_CLOEXEC, 0644);
    if (file < 0) {
        throw std::system_error(errno, std::generic_category(), path);
    }
    struct flock lock = wholeFile(F_WRLCK);
    if (::fcntl(file, F_OFD_SETLK, &lock) != 0) {
        const int number = errno;
        ::close(file);
        throw std::system_error(number, std::generic_category(), path + " is held by another service");
    }
    return file;
}

} // namespace

RunningMark::RunningMark(const std::string& path) : _path(path), _file(openLocked(path)) {
    // What one that was killed has left.
    static_cast<void>(::ftruncate(_file, 0));
}

RunningMark::~RunningMark() {
    ::unlink(_path.c_str());
    ::close(_file);
}

void RunningMark::note(const std::string& trouble) {
    if (trouble == _trouble) {
        return;
    }
    _trouble = trouble;
    // Who reads meanwhile reads less; only people do.
    if (::ftruncate(_file, 0) != 0 ||
        ::pwrite(_file, trouble.data(), trouble.size(), 0) != static_cast<ssize_t>(trouble.size())) {
        _trouble.clear(); // to be tried again
    }
}

RunningState readRunningMark(const std::string& path) {
    const int file = ::open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK);
    if (file < 0) {
        return {};
    }
    // Asks whether it could be locked, and locks nothing.
    struct flock lock = wholeFile(F_RDLCK);
    RunningState state{::fcntl(file, F_OFD_GETLK, &lock) == 0 && lock.l_type != F_UNLCK, ""};
    std::array<char, 1024> text{};
    const ssize_t count = ::pread(file, text.data(), text.size(), 0);
    if (state.runs && count > 0) {
        state.trouble.assign(text.data(), static_cast<std::size_t>(count));
    }
    ::close(file);
    return state;
}

} // namespace welcomer::resolver
