#include "tests/support/MountNamespace.h"

#include <cerrno>
#include <sched.h>
#include <sys/mount.h>
#include <system_error>
#include <unistd.h>

namespace welcomer {

namespace {

void check(int result, const char* what) {
    if (result != 0) {
        throw std::system_error(errno, std::generic_category(), what);
    }
}

} // namespace

bool mayMount() {
    return ::geteuid() == 0;
}

void enterMountNamespace() {
    check(::unshare(CLONE_NEWNS), "a mount namespace");
    check(::mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr), "private mounts");
}

void mountMemory(const std::string& folder, const std::string& size) {
    check(::mount("tmpfs", folder.c_str(), "tmpfs", 0, ("mode=0700,size=" + size).c_str()), "a tmpfs");
}

void makeReadOnly(const std::string& folder, bool readOnly) {
    const unsigned long access = readOnly ? MS_RDONLY : 0;
    check(::mount(nullptr, folder.c_str(), nullptr, MS_REMOUNT | access, nullptr), "a remount");
}

void mountOnItself(const std::string& file) {
    check(::mount(file.c_str(), file.c_str(), nullptr, MS_BIND, nullptr), "a bind mount");
}

void unmount(const std::string& folder) noexcept {
    ::umount2(folder.c_str(), MNT_DETACH);
}

} // namespace welcomer
