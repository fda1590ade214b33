#include "backends/posix/FileLock.h"

#include "tests/contract/TemporaryRoot.h"

#include <gtest/gtest.h>

#include <cerrno>
#include <fcntl.h>
#include <filesystem>
#include <sys/file.h>
#include <sys/stat.h>
#include <thread>

namespace welcomer::posix {

namespace {

using namespace std::chrono_literals;
using Names = std::vector<std::string>;

constexpr char kPath[] = "/home/user/Library/Locks/Accounts";

class FileLockTest : public testing::Test {
  protected:
    FileLockTest() { root.addDirectory("/home/user/Library"); }

    FileLock take(std::chrono::milliseconds patience = 0ms) const {
        return {RootFolder(root.path()), kPath, patience};
    }
    mode_t modeOf(const std::string& path) const {
        struct stat status = {};
        EXPECT_EQ(::lstat(root.locate(path).c_str(), &status), 0) << path;
        return status.st_mode & 07777;
    }

    TemporaryRoot root;
};

} // namespace

TEST_F(FileLockTest, TheFileAndItsFolderAreTheOwnersAloneWhateverTheMask) {
    for (const mode_t mask : {0000U, 0777U}) {
        const mode_t before = ::umask(mask);
        EXPECT_TRUE(take());
        ::umask(before);
        EXPECT_EQ(modeOf("/home/user/Library/Locks"), 0700U) << mask;
        EXPECT_EQ(modeOf(kPath), 0600U) << mask;
        std::filesystem::remove_all(root.locate("/home/user/Library/Locks"));
    }
}

TEST_F(FileLockTest, WhatOthersCouldOpenIsClosedToThem) {
    root.addFile(kPath, "");
    ::chmod(root.locate(kPath).c_str(), 0666);
    ::chmod(root.locate("/home/user/Library/Locks").c_str(), 0777);
    EXPECT_TRUE(take());
    EXPECT_EQ(modeOf("/home/user/Library/Locks"), 0700U);
    EXPECT_EQ(modeOf(kPath), 0600U);
}

TEST_F(FileLockTest, WhoHoldsItKeepsTheNextOneOutUntilTheEnd) {
    {
        const FileLock first = take();
        ASSERT_TRUE(first);
        const FileLock second = take();
        EXPECT_FALSE(second);
        EXPECT_EQ(second.error().number, ETIMEDOUT);
        EXPECT_EQ(second.error().message,
                  root.locate(kPath) + " is locked by another process: waited 0 seconds");
    }
    EXPECT_TRUE(take());
    EXPECT_EQ(root.names("/home/user/Library/Locks"), Names{"Accounts"});
}

TEST_F(FileLockTest, UnlessToldOtherwiseItWaitsForTenSeconds) {
    EXPECT_EQ(FileLock::kPatience, 10s);
}

TEST_F(FileLockTest, ItIsWaitedForUntilItIsFree) {
    FileLock first = take();
    ASSERT_TRUE(first);
    std::thread waiting([this] { EXPECT_TRUE(take(60s)); });
    first = FileLock();
    waiting.join();
}

TEST_F(FileLockTest, TheRootFoldersSpellingMakesNoDifference) {
    std::filesystem::create_directory_symlink(root.path(), root.locate("/itself"));
    const FileLock first = take();
    ASSERT_TRUE(first);
    for (const std::string& spelling : {root.path() + "/", root.path() + "/home/..", root.locate("/itself"),
                                        root.locate("/itself/itself")}) {
        EXPECT_EQ(FileLock(RootFolder(spelling), kPath, 0ms).error().number, ETIMEDOUT) << spelling;
    }
    EXPECT_EQ(FileLock(RootFolder("/"), root.locate(kPath), 0ms).error().number, ETIMEDOUT);
}

TEST_F(FileLockTest, AnotherNameIsAnotherLock) {
    const FileLock first = take();
    EXPECT_TRUE(FileLock(RootFolder(root.path()), "/home/user/Library/Locks/Preferences", 0ms));
}

TEST_F(FileLockTest, LinksAreNotFollowed) {
    root.addDirectory("/elsewhere");
    std::filesystem::create_symlink("/elsewhere", root.locate("/home/user/Library/Locks"));
    EXPECT_EQ(take().error().number, ENOTDIR);
    EXPECT_EQ(root.names("/elsewhere"), Names{});
    std::filesystem::remove(root.locate("/home/user/Library/Locks"));
    root.addDirectory("/home/user/Library/Locks");
    std::filesystem::create_symlink("/elsewhere/file", root.locate(kPath));
    EXPECT_EQ(take().error().number, ELOOP);
    EXPECT_EQ(root.names("/elsewhere"), Names{});
}

TEST_F(FileLockTest, WhatIsAnothersIsNotUsed) {
    if (::geteuid() != 0) {
        GTEST_SKIP() << "only root can give files away";
    }
    root.addFile(kPath, "");
    const std::string folder = "/home/user/Library/Locks";
    for (const std::string& path : {std::string(kPath), folder}) {
        ASSERT_EQ(::chown(root.locate(path).c_str(), 65534, 65534), 0);
        EXPECT_EQ(take().error().number, EPERM) << path;
        ASSERT_EQ(::chown(root.locate(path).c_str(), 0, 0), 0);
    }
    EXPECT_TRUE(take());
}

TEST_F(FileLockTest, TheFoldersAboveAreNotMade) {
    std::filesystem::remove_all(root.locate("/home"));
    const FileLock lock = take();
    EXPECT_EQ(lock.error().number, ENOENT);
    EXPECT_NE(lock.error().message.find(root.locate("/home/user/Library/Locks")), std::string::npos);
    EXPECT_EQ(root.names("/"), Names{});
}

} // namespace welcomer::posix
