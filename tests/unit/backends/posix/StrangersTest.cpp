#include "backends/posix/Strangers.h"

#include "tests/contract/TemporaryRoot.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <sys/stat.h>
#include <unistd.h>

namespace welcomer::posix {
namespace {

class StrangersTest : public testing::Test {
  protected:
    void SetUp() override {
        root.addFile("/folder/file", "");
        setMode("/folder/file", 0644);
        setMode("/folder", 0755);
    }

    void setMode(const std::string& path, mode_t mode) const {
        ASSERT_EQ(::chmod(root.locate(path).c_str(), mode), 0);
    }

    std::string stranger(const std::string& path, bool mayBeOwn = false) const {
        return strangerWhoMayChange(RootFolder(root.path()), path, mayBeOwn);
    }

    // As it is asked for each file of a folder in turn.
    std::string strangerInTurn(const std::string& path) {
        struct stat status = {};
        EXPECT_EQ(::lstat(root.locate(path).c_str(), &status), 0);
        return remembering.whoMayChange(path, S_ISLNK(status.st_mode) ? nullptr : &status);
    }

    TemporaryRoot root;
    FolderStrangers remembering{RootFolder(root.path())};
};

TEST_F(StrangersTest, WhatBelongsToTheRootFoldersOwnerIsRight) {
    EXPECT_EQ(stranger("/folder/file"), "");
    EXPECT_EQ(stranger("/folder"), "");
    EXPECT_EQ(stranger("/missing"), "");
}

TEST_F(StrangersTest, NobodyElseMayWriteItNorWhatLeadsToIt) {
    setMode("/folder/file", 0646);
    EXPECT_EQ(stranger("/folder/file"), "everybody may write " + root.locate("/folder/file"));
    setMode("/folder/file", 0644);
    setMode("/folder", 0757);
    EXPECT_EQ(stranger("/folder/file"), "everybody may write " + root.locate("/folder"));
}

TEST_F(StrangersTest, WithAStickyBitAFolderOnTheWayIsRightButNotTheOneThatIsAskedFor) {
    setMode("/folder", 01777);
    EXPECT_EQ(stranger("/folder/file"), "");
    EXPECT_EQ(stranger("/folder"), "everybody may write " + root.locate("/folder"));
}

TEST_F(StrangersTest, ALinkIsWhatItLeadsTo) {
    std::filesystem::create_symlink("folder/file", root.locate("/link"));
    setMode("/folder/file", 0646);
    EXPECT_EQ(stranger("/link"), "everybody may write " + root.locate("/folder/file"));
}

TEST_F(StrangersTest, AGroupThatMayWriteTheRootFolderMayWriteBelowIt) {
    if (::geteuid() != 0) {
        GTEST_SKIP() << "giving files to other groups needs root";
    }
    constexpr gid_t kGroup = 12345;
    ASSERT_EQ(::chown(root.locate("/folder/file").c_str(), 0, kGroup), 0);
    setMode("/folder/file", 0664);
    EXPECT_EQ(stranger("/folder/file"), "group 12345 may write " + root.locate("/folder/file"));
    ASSERT_EQ(::chown(root.path().c_str(), 0, kGroup), 0);
    EXPECT_EQ(stranger("/folder/file"), "group 12345 may write " + root.locate("/folder/file"));
    setMode("", 0775);
    EXPECT_EQ(stranger("/folder/file"), "");
}

TEST_F(StrangersTest, WhatBelongsToOthersIsWrong) {
    if (::geteuid() != 0) {
        GTEST_SKIP() << "giving files away needs root";
    }
    ASSERT_EQ(::chown(root.locate("/folder/file").c_str(), 12345, 0), 0);
    EXPECT_EQ(stranger("/folder/file"), root.locate("/folder/file") + " belongs to user 12345");
    EXPECT_EQ(stranger("/folder/file", true), root.locate("/folder/file") + " belongs to user 12345");
}

TEST_F(StrangersTest, WhatIsOnesOwnIsRightWhereNobodyElseLoadsIt) {
    if (::geteuid() != 0) {
        GTEST_SKIP() << "a root folder of somebody else's needs root";
    }
    ASSERT_EQ(::chown(root.locate("/folder/file").c_str(), 12345, 0), 0);
    setMode("", 0755); // so that the other user may look at all
    ASSERT_EQ(::seteuid(12345), 0);
    const std::string own = stranger("/folder/file", true);
    const std::string others = stranger("/folder/file", false);
    ASSERT_EQ(::seteuid(0), 0);
    EXPECT_EQ(own, "");
    EXPECT_EQ(others, root.locate("/folder/file") + " belongs to user 12345");
}

TEST_F(StrangersTest, OneFileAfterTheOtherIsLookedAt) {
    root.addFile("/folder/other", "");
    setMode("/folder/other", 0646);
    EXPECT_EQ(strangerInTurn("/folder/file"), "");
    EXPECT_EQ(strangerInTurn("/folder/other"), "everybody may write " + root.locate("/folder/other"));
    EXPECT_EQ(strangerInTurn("/folder/file"), "");
    EXPECT_EQ(strangerInTurn("/folder"), "");
}

TEST_F(StrangersTest, AFolderThatChangesIsLookedAtAnew) {
    EXPECT_EQ(strangerInTurn("/folder/file"), "");
    setMode("/folder", 01777); // whoever may write there may add to it
    EXPECT_EQ(strangerInTurn("/folder/file"), "everybody may write " + root.locate("/folder"));
    setMode("/folder", 0755);
    EXPECT_EQ(strangerInTurn("/folder/file"), "");
}

TEST_F(StrangersTest, AnotherFolderIsLookedAtForItself) {
    root.addFile("/open/file", "");
    setMode("/open", 0757);
    EXPECT_EQ(strangerInTurn("/folder/file"), "");
    EXPECT_EQ(strangerInTurn("/open/file"), "everybody may write " + root.locate("/open"));
    EXPECT_EQ(strangerInTurn("/folder/file"), "");
}

TEST_F(StrangersTest, AFolderThatIsPutInThePlaceOfAnotherIsLookedAtAnew) {
    root.addFile("/open/file", "");
    setMode("/open", 0757);
    std::filesystem::create_symlink("folder", root.locate("/link"));
    EXPECT_EQ(strangerInTurn("/link/file"), "");
    std::filesystem::remove(root.locate("/link"));
    std::filesystem::create_symlink("open", root.locate("/link"));
    EXPECT_EQ(strangerInTurn("/link/file"), "everybody may write " + root.locate("/open"));
}

TEST_F(StrangersTest, OfALinkInAFolderTheFileThatItLeadsToIsLookedAt) {
    root.addFile("/open/file", "");
    setMode("/open", 0757);
    std::filesystem::create_symlink("../open/file", root.locate("/folder/link"));
    EXPECT_EQ(strangerInTurn("/folder/file"), "");
    EXPECT_EQ(strangerInTurn("/folder/link"), "everybody may write " + root.locate("/open"));
}

} // namespace
} // namespace welcomer::posix
