#include "backends/posix/BecomeUser.h"

#include "backends/posix/SystemError.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdlib>
#include <grp.h>
#include <linux/capability.h>
#include <sys/prctl.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>
#include <utility>
#include <vector>

namespace welcomer::posix {

namespace {

constexpr mode_t kPrivate = 077;
constexpr const char* kPath = "/usr/local/bin:/usr/bin:/bin";
constexpr const char* kKept[] = {"TERM", "LANG", "LANGUAGE", "LC_ALL", "LC_CTYPE", "LC_MESSAGES"};

// The kernel takes them away with root's id, but not from a process that was told to keep them.
bool dropCapabilities() {
    __user_cap_header_struct header = {_LINUX_CAPABILITY_VERSION_3, 0};
    const std::array<__user_cap_data_struct, _LINUX_CAPABILITY_U32S_3> none = {};
    return ::syscall(SYS_capset, &header, none.data()) == 0;
}

// Whether all ids are the user's, and root's cannot be had again.
bool isUserForGood(const PasswordEntry& user) {
    std::array<uid_t, 3> users = {};
    std::array<gid_t, 3> groups = {};
    const auto unchanged = static_cast<uid_t>(-1);
    return ::getresuid(&users[0], &users[1], &users[2]) == 0 &&
           ::getresgid(&groups[0], &groups[1], &groups[2]) == 0 &&
           std::ranges::count(users, user.userID) == 3 && std::ranges::count(groups, user.groupID) == 3 &&
           ::setresuid(unchanged, 0, unchanged) != 0 && ::setuid(0) != 0;
}

void takeEnvironmentOf(const PasswordEntry& user) {
    std::vector<std::pair<const char*, std::string>> kept{
        {"PATH", kPath},
        {"HOME", user.home},
        {"USER", user.name},
        {"LOGNAME", user.name},
        {"SHELL", user.shell.empty() ? "/bin/sh" : user.shell}};
    for (const char* const name : kKept) {
        if (const char* const value = std::getenv(name)) {
            kept.emplace_back(name, value);
        }
    }
    ::clearenv();
    for (const auto& [name, value] : kept) {
        ::setenv(name, value.c_str(), 1);
    }
}

} // namespace

platform::Outcome becomeUser(const PasswordEntry& user) {
    const std::string what = "cannot become the user " + user.name;
    if (::initgroups(user.name.c_str(), user.groupID) != 0 ||
        ::setresgid(user.groupID, user.groupID, user.groupID) != 0 ||
        ::setresuid(user.userID, user.userID, user.userID) != 0 || !dropCapabilities() ||
        ::prctl(PR_SET_NO_NEW_PRIVS, 1, 0, 0, 0) != 0 || ::prctl(PR_SET_DUMPABLE, 0, 0, 0, 0) != 0 ||
        ::chdir("/") != 0) {
        return systemOutcome(what, errno);
    }
    if (!isUserForGood(user)) {
        return platform::Outcome::failure({EPERM, what + ": there is a way back"});
    }
    ::umask(kPrivate);
    takeEnvironmentOf(user);
    return platform::Outcome::success();
}

} // namespace welcomer::posix
