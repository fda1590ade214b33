#include "tests/support/SystemCallFaults.h"

#include <cerrno>
#include <cstdarg>
#include <cstddef>
#include <cstdlib>
#include <dlfcn.h>
#include <fcntl.h>
#include <sys/file.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/types.h>
#include <unistd.h>
#include <utility>

namespace welcomer {

namespace {

enum class Mode { Off, Count, Fail, Crash };

Mode mode = Mode::Off;
std::vector<std::string> calls;
std::size_t target = 0;
int targetError = 0;

// Counts a call. True when it is the one to fail or to crash at.
bool isTarget(const char* name) {
    if (mode == Mode::Off) {
        return false;
    }
    calls.emplace_back(name);
    return mode != Mode::Count && calls.size() == target;
}

// Counts a call. True when it must fail, with errno set.
bool mustFail(const char* name) {
    if (!isTarget(name)) {
        return false;
    }
    if (mode == Mode::Crash) {
        ::_exit(SystemCallFaults::kCrashed);
    }
    errno = targetError;
    return true;
}

// The C library's own function, or a sanitizer's.
template <typename Function>
Function* real(const char* name) {
    return reinterpret_cast<Function*>(::dlsym(RTLD_NEXT, name));
}

void start(Mode newMode, int number, int error) {
    mode = newMode;
    calls.clear();
    target = static_cast<std::size_t>(number);
    targetError = error;
}

} // namespace

void SystemCallFaults::count() {
    start(Mode::Count, 0, 0);
}

void SystemCallFaults::failAt(int number, int error) {
    start(Mode::Fail, number, error);
}

void SystemCallFaults::crashAt(int number) {
    start(Mode::Crash, number, 0);
}

std::vector<std::string> SystemCallFaults::stop() {
    mode = Mode::Off;
    return std::exchange(calls, {});
}

} // namespace welcomer

using welcomer::mustFail;
using welcomer::real;

extern "C" {

int stat(const char* path, struct stat* status) noexcept {
    static const auto next = real<int(const char*, struct stat*)>("stat");
    return mustFail("stat") ? -1 : next(path, status);
}

int fchmodat(int folder, const char* path, mode_t mode, int flags) noexcept {
    static const auto next = real<int(int, const char*, mode_t, int)>("fchmodat");
    return mustFail("fchmodat") ? -1 : next(folder, path, mode, flags);
}

int fchmod(int file, mode_t mode) noexcept {
    static const auto next = real<int(int, mode_t)>("fchmod");
    return mustFail("fchmod") ? -1 : next(file, mode);
}

int fstat(int file, struct stat* status) noexcept {
    static const auto next = real<int(int, struct stat*)>("fstat");
    return mustFail("fstat") ? -1 : next(file, status);
}

int fsync(int file) {
    static const auto next = real<int(int)>("fsync");
    return mustFail("fsync") ? -1 : next(file);
}

int flock(int file, int operation) noexcept {
    static const auto next = real<int(int, int)>("flock");
    return mustFail("flock") ? -1 : next(file, operation);
}

int ftruncate(int file, off_t size) noexcept {
    static const auto next = real<int(int, off_t)>("ftruncate");
    return mustFail("ftruncate") ? -1 : next(file, size);
}

int linkat(int fromFolder, const char* from, int toFolder, const char* to, int flags) noexcept {
    static const auto next = real<int(int, const char*, int, const char*, int)>("linkat");
    return mustFail("linkat") ? -1 : next(fromFolder, from, toFolder, to, flags);
}

// These two a library makes for the program, which has to find them here.
[[gnu::visibility("default")]] ssize_t sendto(int socket, const void* data, size_t size, int flags,
                                              const sockaddr* to, socklen_t length) {
    static const auto next =
        real<ssize_t(int, const void*, size_t, int, const sockaddr*, socklen_t)>("sendto");
    return mustFail("sendto") ? -1 : next(socket, data, size, flags, to, length);
}

[[gnu::visibility("default")]] ssize_t recvmsg(int socket, msghdr* message, int flags) {
    static const auto next = real<ssize_t(int, msghdr*, int)>("recvmsg");
    return mustFail("recvmsg") ? -1 : next(socket, message, flags);
}

int mkdirat(int folder, const char* path, mode_t mode) noexcept {
    static const auto next = real<int(int, const char*, mode_t)>("mkdirat");
    return mustFail("mkdirat") ? -1 : next(folder, path, mode);
}

int open(const char* path, int flags, ...) {
    static const auto next = real<int(const char*, int, ...)>("open");
    va_list arguments;
    va_start(arguments, flags);
    const mode_t mode = va_arg(arguments, mode_t); // meaningless unless a file is created
    va_end(arguments);
    return mustFail("open") ? -1 : next(path, flags, mode);
}

int openat(int folder, const char* path, int flags, ...) {
    static const auto next = real<int(int, const char*, int, ...)>("openat");
    va_list arguments;
    va_start(arguments, flags);
    const mode_t mode = va_arg(arguments, mode_t);
    va_end(arguments);
    return mustFail("openat") ? -1 : next(folder, path, flags, mode);
}

int posix_fallocate(int file, off_t offset, off_t size) {
    static const auto next = real<int(int, off_t, off_t)>("posix_fallocate");
    if (!mustFail("posix_fallocate")) {
        return next(file, offset, size);
    }
    // Where the file system cannot reserve space, the C library writes, and has written a part when it fails.
    const int error = errno;
    return ::lseek(file, offset + size - 1, SEEK_SET) < 0 || ::write(file, "", 1) < 0 ? errno : error;
}

ssize_t read(int file, void* buffer, size_t size) {
    static const auto next = real<ssize_t(int, void*, size_t)>("read");
    return mustFail("read") ? -1 : next(file, buffer, size);
}

int renameat(int fromFolder, const char* from, int toFolder, const char* to) noexcept {
    static const auto next = real<int(int, const char*, int, const char*)>("renameat");
    return mustFail("renameat") ? -1 : next(fromFolder, from, toFolder, to);
}

int unlink(const char* path) noexcept {
    static const auto next = real<int(const char*)>("unlink");
    return mustFail("unlink") ? -1 : next(path);
}

int unlinkat(int folder, const char* path, int flags) noexcept {
    static const auto next = real<int(int, const char*, int)>("unlinkat");
    return mustFail("unlinkat") ? -1 : next(folder, path, flags);
}

ssize_t write(int file, const void* buffer, size_t size) {
    static const auto next = real<ssize_t(int, const void*, size_t)>("write");
    if (!welcomer::isTarget("write")) {
        return next(file, buffer, size);
    }
    if (welcomer::mode == welcomer::Mode::Crash) {
        const ssize_t half = next(file, buffer, size / 2);
        ::_exit(half < 0 ? EXIT_FAILURE : welcomer::SystemCallFaults::kCrashed);
    }
    errno = welcomer::targetError;
    return -1;
}

} // extern "C"
