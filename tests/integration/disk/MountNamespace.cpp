#include "tests/integration/disk/MountNamespace.h"

#include <cerrno>
#include <sched.h>
#include <sys/mount.h>
#include <system_error>

namespace welcomer {

namespace {

void check(int result, const char* what) {
    if (result != 0) {
        throw std::system_error(errno, std::generic_category(), what);
    }
}

} // namespace

void enterMountNamespace() {
    check(unshare(CLONE_NEWNS), "a mount namespace");
    check(mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr), "private mounts");
}

void mountMemory(const std::string& folder, const std::string& size) {
    check(mount("tmpfs", folder.c_str(), "tmpfs", 0, ("mode=0700,size=" + size).c_str()), "a tmpfs");
}

void unmount(const std::string& folder) noexcept {
    umount2(folder.c_str(), MNT_DETACH);
}

void makeReadOnly(const std::string& folder) {
    check(mount(nullptr, folder.c_str(), nullptr, MS_REMOUNT | MS_RDONLY, nullptr), "read-only");
}

} // namespace welcomer
