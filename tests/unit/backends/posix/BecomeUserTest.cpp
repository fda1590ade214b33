// Giving root's rights away for good. Each test does it in a process of its own.

#include "backends/posix/BecomeUser.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <functional>
#include <linux/securebits.h>
#include <sys/prctl.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

namespace welcomer::posix {
namespace {

constexpr uid_t kUserID = 31999;
const PasswordEntry kUser{"newcomer", kUserID, kUserID, "/home/newcomer", ""};

class BecomeUserTest : public testing::Test {
  protected:
    void SetUp() override {
        if (::geteuid() != 0) {
            GTEST_SKIP() << "only root can become somebody else";
        }
    }

    // Whether all that a process says of itself holds.
    static bool holdsInAnotherProcess(const std::function<bool()>& holds) {
        const pid_t process = ::fork();
        if (process == 0) {
            ::_exit(holds() ? 0 : 1);
        }
        int status = -1;
        return ::waitpid(process, &status, 0) == process && status == 0;
    }
};

TEST_F(BecomeUserTest, AllIDsAreTheUsersAndThereIsNoWayBack) {
    EXPECT_TRUE(holdsInAnotherProcess([] {
        return becomeUser(kUser) && ::getuid() == kUserID && ::geteuid() == kUserID &&
               ::getgid() == kUserID && ::getegid() == kUserID && ::setuid(0) != 0 && ::seteuid(0) != 0 &&
               ::setgid(0) != 0 && ::access("/root/.", R_OK) != 0;
    }));
}

TEST_F(BecomeUserTest, RightsThatTheProcessWasToldToKeepAreGivenAwayToo) {
    EXPECT_TRUE(holdsInAnotherProcess([] {
        return ::prctl(PR_SET_SECUREBITS, SECBIT_NO_SETUID_FIXUP | SECBIT_KEEP_CAPS, 0, 0, 0) == 0 &&
               becomeUser(kUser) && ::setuid(0) != 0 && ::setgid(0) != 0 && ::chroot("/") != 0;
    }));
}

TEST_F(BecomeUserTest, TheEnvironmentIsAFreshLogins) {
    EXPECT_TRUE(holdsInAnotherProcess([] {
        ::setenv("DBUS_SESSION_BUS_ADDRESS", "unix:path=/nowhere", 1);
        ::setenv("XDG_RUNTIME_DIR", "/run/user/0", 1);
        ::setenv("LD_PRELOAD", "", 1);
        ::setenv("LANG", "C.UTF-8", 1);
        return becomeUser(kUser) && std::getenv("HOME") == kUser.home && std::getenv("USER") == kUser.name &&
               std::getenv("SHELL") == std::string("/bin/sh") &&
               std::getenv("LANG") == std::string("C.UTF-8") && !std::getenv("DBUS_SESSION_BUS_ADDRESS") &&
               !std::getenv("XDG_RUNTIME_DIR") && !std::getenv("LD_PRELOAD");
    }));
}

TEST_F(BecomeUserTest, NothingGetsRightsBackAndNobodyLooksIn) {
    EXPECT_TRUE(holdsInAnotherProcess([] {
        return becomeUser(kUser) && ::prctl(PR_GET_NO_NEW_PRIVS, 0, 0, 0, 0) == 1 &&
               ::prctl(PR_GET_DUMPABLE, 0, 0, 0, 0) == 0 && ::umask(0) == 077;
    }));
}

TEST_F(BecomeUserTest, WhoIsNotRootBecomesNobodyElse) {
    EXPECT_TRUE(holdsInAnotherProcess([] {
        PasswordEntry other = kUser;
        other.userID += 1;
        const bool isUser = static_cast<bool>(becomeUser(kUser));
        const platform::Outcome again = becomeUser(other);
        return isUser && !again && again.error.message.starts_with("cannot become the user newcomer: ");
    }));
}

} // namespace
} // namespace welcomer::posix
