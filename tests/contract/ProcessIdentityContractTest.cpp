// What every process identity must do.

#include "backends/local/LocalProcessIdentity.h"
#include "tests/contract/TemporaryRoot.h"
#include "tests/fakes/FakeProcessIdentity.h"

#include <gtest/gtest.h>

#include <sys/stat.h>

namespace welcomer::contract {

namespace {

struct LocalUser {
    TemporaryRoot root;
    local::LocalProcessIdentity identity{posix::RootFolder(root.path())};

    void addDirectory(const std::string& path, mode_t mode) const {
        root.addDirectory(path);
        ::chmod(root.locate(path).c_str(), mode);
    }
    std::optional<mode_t> mode(const std::string& path) const {
        struct stat status = {};
        return ::stat(root.locate(path).c_str(), &status) == 0 ? std::optional(status.st_mode & 07777U)
                                                               : std::nullopt;
    }
};

struct FakeUser {
    fakes::CallRecorder recorder;
    fakes::FakeFileSystem fileSystem{recorder};
    fakes::FakeProcessIdentity identity{recorder, fileSystem};

    void addDirectory(const std::string& path, mode_t mode) { fileSystem.addDirectory(path, mode); }
    std::optional<mode_t> mode(const std::string& path) const { return fileSystem.mode(path); }
};

struct BackendNames {
    template <typename Backend>
    static std::string GetName(int) {
        return std::is_same_v<Backend, LocalUser> ? "Local" : "Fake";
    }
};

template <typename Backend>
class ProcessIdentityContract : public testing::Test {
  protected:
    std::string library() { return this->user.identity.homeDirectory() + "/Library"; }

    Backend user;
};

using Backends = testing::Types<LocalUser, FakeUser>;
TYPED_TEST_SUITE(ProcessIdentityContract, Backends, BackendNames);

} // namespace

TYPED_TEST(ProcessIdentityContract, TheUserHasANameAndAnAbsoluteHome) {
    EXPECT_FALSE(this->user.identity.loginName().empty());
    EXPECT_TRUE(this->user.identity.homeDirectory().starts_with('/'));
    EXPECT_EQ(this->user.identity.effectiveUserID(), this->user.identity.effectiveUserID());
}

TYPED_TEST(ProcessIdentityContract, TheLibraryFolderIsMadeForTheUserAlone) {
    this->user.addDirectory(this->user.identity.homeDirectory(), 0755);

    const std::vector<std::string> libraries = this->user.identity.userLibraryDirectories();

    ASSERT_FALSE(libraries.empty());
    EXPECT_EQ(libraries.front(), this->library());
    EXPECT_EQ(this->user.mode(this->library()), 0700U);
}

TYPED_TEST(ProcessIdentityContract, AnExistingLibraryFolderIsUsedAsItStands) {
    this->user.addDirectory(this->library(), 0750);

    EXPECT_EQ(this->user.identity.userLibraryDirectories().front(), this->library());
    EXPECT_EQ(this->user.mode(this->library()), 0750U);
}

TYPED_TEST(ProcessIdentityContract, WithoutAHomeThePathIsGivenAndNothingIsMade) {
    EXPECT_EQ(this->user.identity.userLibraryDirectories().front(), this->library());
    EXPECT_EQ(this->user.mode(this->user.identity.homeDirectory()), std::nullopt);
}

} // namespace welcomer::contract
