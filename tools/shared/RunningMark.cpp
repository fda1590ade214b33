#include "tools/shared/RunningMark.h"

#include <array>
#include <cerrno>
#include <cstdio>
#include <fcntl.h>
#include <sys/stat.h>
#include <system_error>
#include <unistd.h>
#include <utility>

namespace welcomer::resolver {

namespace {

// Of the file description: it ends with it, however the process ends, and children do not inherit it.
struct flock wholeFile(short type) {
    struct flock lock {};
    lock.l_type = type;
    lock.l_whence = SEEK_SET;
    return lock;
}

// A descriptor that closes itself unless it is taken.
class File {
  public:
    explicit File(int descriptor) : _descriptor(descriptor) {}
    ~File() {
        if (_descriptor >= 0) {
            ::close(_descriptor);
        }
    }
    File(const File&) = delete;
    File& operator=(const File&) = delete;

    int get() const { return _descriptor; }
    int take() { return std::exchange(_descriptor, -1); }

  private:
    int _descriptor;
};

bool isAt(int file, const std::string& path) {
    struct stat opened = {};
    struct stat present = {};
    return ::fstat(file, &opened) == 0 && ::lstat(path.c_str(), &present) == 0 &&
           opened.st_ino == present.st_ino && opened.st_dev == present.st_dev;
}

int openLocked(const std::string& path) {
    // Until it has its own name the file is its owner's alone, and its lock the right to take that name.
    const std::string fresh = path + ".new";
    while (true) {
        File file(::open(fresh.c_str(), O_RDWR | O_CREAT | O_NOFOLLOW | O_CLOEXEC, 0600));
        if (file.get() < 0) {
            throw std::system_error(errno, std::generic_category(), path);
        }
        struct flock lock = wholeFile(F_WRLCK);
        if (::fcntl(file.get(), F_OFD_SETLK, &lock) != 0) {
            throw std::system_error(errno, std::generic_category(), path + " is held by another service");
        }
        if (!isAt(file.get(), fresh)) {
            continue; // another service has had it meanwhile
        }
        if (readRunningMark(path).runs) {
            ::unlink(fresh.c_str());
            throw std::system_error(EAGAIN, std::generic_category(), path + " is held by another service");
        }
        if (::ftruncate(file.get(), 0) != 0 || ::rename(fresh.c_str(), path.c_str()) != 0 ||
            ::fchmod(file.get(), 0644) != 0) {
            throw std::system_error(errno, std::generic_category(), path);
        }
        return file.take();
    }
}

} // namespace

RunningMark::RunningMark(const std::string& path) : _path(path), _file(openLocked(path)) {}

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
