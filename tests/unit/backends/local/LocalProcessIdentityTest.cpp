#include "backends/local/LocalProcessIdentity.h"

#include "platform/Error.h"
#include "tests/contract/TemporaryRoot.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <pwd.h>
#include <sys/stat.h>
#include <unistd.h>

namespace welcomer::local {

TEST(LocalProcessIdentityTest, NameAndHomeAreThePasswordDatabases) {
    const passwd* const entry = ::getpwuid(::geteuid());
    ASSERT_NE(entry, nullptr);
    LocalProcessIdentity identity(posix::RootFolder("/"));

    EXPECT_EQ(identity.effectiveUserID(), ::geteuid());
    EXPECT_EQ(identity.loginName(), entry->pw_name);
    EXPECT_EQ(identity.homeDirectory(), entry->pw_dir);
}

TEST(LocalProcessIdentityTest, NoEnvironmentVariableIsAsked) {
    LocalProcessIdentity expected(posix::RootFolder("/"));
    for (const char* name : {"HOME", "USER", "LOGNAME", "XDG_CONFIG_HOME"}) {
        ::setenv(name, "/elsewhere", 1);
    }
    LocalProcessIdentity identity(posix::RootFolder("/"));

    EXPECT_EQ(identity.homeDirectory(), expected.homeDirectory());
    EXPECT_EQ(identity.loginName(), expected.loginName());
}

TEST(LocalProcessIdentityTest, AUserWhomNobodyKnowsHasANumberAndNoHome) {
    constexpr uid_t kNobodysID = 1234567;
    if (::geteuid() != 0) {
        GTEST_SKIP() << "only the superuser can become another user";
    }
    ASSERT_EQ(::getpwuid(kNobodysID), nullptr);
    const TemporaryRoot root;
    LocalProcessIdentity identity{posix::RootFolder(root.path())};
    ASSERT_EQ(::seteuid(kNobodysID), 0);

    EXPECT_EQ(identity.effectiveUserID(), kNobodysID);
    EXPECT_EQ(identity.loginName(), "1234567");
    try {
        ADD_FAILURE() << "has the home " << identity.homeDirectory();
    } catch (const platform::Exception& exception) {
        EXPECT_STREQ(exception.what(), "the user 1234567 has no home folder");
    }
    EXPECT_EQ(identity.userLibraryDirectories(), std::vector<std::string>{});
    ASSERT_EQ(::seteuid(0), 0);
}

TEST(LocalProcessIdentityTest, TheEffectiveUserCountsNotTheRealOne) {
    if (::geteuid() != 0) {
        GTEST_SKIP() << "only the superuser can become another user";
    }
    const passwd* const other = ::getpwnam("daemon");
    ASSERT_NE(other, nullptr);
    const std::string home = other->pw_dir;
    LocalProcessIdentity identity(posix::RootFolder("/"));
    ASSERT_EQ(::seteuid(other->pw_uid), 0);

    EXPECT_EQ(identity.loginName(), "daemon");
    EXPECT_EQ(identity.homeDirectory(), home);
    ASSERT_EQ(::seteuid(0), 0);
}

TEST(LocalProcessIdentityTest, TheLibraryFoldersModeIsExactWhateverTheMask) {
    const TemporaryRoot root;
    LocalProcessIdentity identity{posix::RootFolder(root.path())};
    root.addDirectory(identity.homeDirectory());
    const mode_t mask = ::umask(0777);
    const std::string library = root.locate(identity.userLibraryDirectories().front());
    ::umask(mask);

    struct stat status = {};
    ASSERT_EQ(::stat(library.c_str(), &status), 0);
    EXPECT_EQ(status.st_mode & 07777, 0700U);
}

} // namespace welcomer::local
