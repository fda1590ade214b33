#include "backends/local/LocalFileSystem.h"

#include "tests/contract/TemporaryRoot.h"
#include "tests/support/MountNamespace.h"
#include "tests/support/SystemCallFaults.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cerrno>
#include <fcntl.h>
#include <filesystem>
#include <sys/file.h>
#include <sys/stat.h>
#include <sys/wait.h>

namespace welcomer::local {

namespace {

using Names = std::vector<std::string>;

class LocalFileSystemTest : public testing::Test {
  protected:
    mode_t modeOf(const std::string& path) {
        struct stat status = {};
        EXPECT_EQ(::lstat(root.locate(path).c_str(), &status), 0) << path;
        return status.st_mode & 07777;
    }

    TemporaryRoot root;
    LocalFileSystem fileSystem{posix::RootFolder(root.path())};
};

// More than one read of the copy.
const std::string kContent(200000, 'c');

} // namespace

TEST_F(LocalFileSystemTest, TheDefaultRootLeavesPathsAsTheyAre) {
    EXPECT_EQ(posix::RootFolder("/").shown("/etc/passwd"), "/etc/passwd");
    EXPECT_EQ(posix::RootFolder("/").shown("/"), "/");
    EXPECT_EQ(posix::RootFolder("/some/root/").shown("/etc/"), "/some/root/etc");
    EXPECT_EQ(posix::RootFolder("/some/root").shown("/"), "/some/root");
}

TEST_F(LocalFileSystemTest, AFoldersModeIsExactWhateverTheMask) {
    for (const mode_t mask : {0000U, 0022U, 0077U, 0777U}) {
        const mode_t before = ::umask(mask);
        const platform::Outcome outcome = fileSystem.createDirectory("/folder", 0755);
        ::umask(before);

        EXPECT_TRUE(outcome);
        EXPECT_EQ(modeOf("/folder"), 0755U) << mask;
        EXPECT_TRUE(fileSystem.remove("/folder"));
    }
}

TEST_F(LocalFileSystemTest, AFolderThatCannotGetItsModeIsNotLeftBehind) {
    LocalFileSystem whole{posix::RootFolder("/")};
    SystemCallFaults::failAt(2, EPERM); // mkdirat, then fchmodat
    const platform::Outcome outcome = whole.createDirectory(root.locate("/folder"), 0755);
    SystemCallFaults::stop();

    EXPECT_EQ(outcome.error.number, EPERM);
    EXPECT_EQ(root.names("/"), Names{});
}

TEST_F(LocalFileSystemTest, ACopysPermissionsAreExactWhateverTheMask) {
    root.addFile("/file", "text");
    ::chmod(root.locate("/file").c_str(), 0666);
    const mode_t before = ::umask(0077);
    EXPECT_TRUE(fileSystem.copy("/file", "/copy"));
    ::umask(before);

    EXPECT_EQ(modeOf("/copy"), 0666U);
}

TEST_F(LocalFileSystemTest, ACopyDoesNotRunAsAnotherUser) {
    root.addFile("/file", "text");
    ::chmod(root.locate("/file").c_str(), 06755);

    EXPECT_TRUE(fileSystem.copy("/file", "/copy"));
    EXPECT_EQ(modeOf("/copy"), 0755U);
}

TEST_F(LocalFileSystemTest, APipeIsNotCopiedAndDoesNotBlock) {
    ASSERT_EQ(::mkfifo(root.locate("/pipe").c_str(), 0600), 0);

    EXPECT_EQ(fileSystem.copy("/pipe", "/copy").error.number, EINVAL);
    EXPECT_EQ(root.names("/"), Names{"pipe"});
}

TEST_F(LocalFileSystemTest, ACopyIsSyncedBeforeItGetsItsName) {
    root.addFile("/file", "text");

    SystemCallFaults::count();
    ASSERT_TRUE(fileSystem.copy("/file", "/copy"));
    const Names calls = SystemCallFaults::stop();

    EXPECT_EQ(Names(calls.end() - 3, calls.end()), (Names{"fsync", "linkat", "unlinkat"}));
}

TEST_F(LocalFileSystemTest, ACopyLeavesNothingBehindWhicheverCallFails) {
    root.addFile("/from/file", kContent);
    root.addDirectory("/to");
    for (int number = 1;; ++number) {
        SystemCallFaults::failAt(number, ENOSPC);
        const platform::Outcome outcome = fileSystem.copy("/from/file", "/to/copy");
        const auto calls = static_cast<int>(SystemCallFaults::stop().size());

        if (outcome) {
            EXPECT_EQ(root.content("/to/copy"), kContent) << number;
        } else {
            EXPECT_EQ(outcome.error.number, ENOSPC) << number;
            EXPECT_EQ(root.names("/to"), Names{}) << number;
        }
        if (number > calls) {
            EXPECT_TRUE(outcome);
            EXPECT_GT(number, 10);
            return;
        }
        for (const std::string& name : root.names("/to")) {
            EXPECT_TRUE(fileSystem.remove("/to/" + name));
        }
    }
}

TEST_F(LocalFileSystemTest, ACopyHasItsNameOnlyWhenItIsWholeWhereverTheProcessIsKilled) {
    root.addFile("/from/file", kContent);
    root.addDirectory("/to");
    for (int number = 1;; ++number) {
        const pid_t child = ::fork();
        if (child == 0) {
            SystemCallFaults::crashAt(number);
            ::_exit(fileSystem.copy("/from/file", "/to/copy") ? 0 : 1);
        }
        int status = 0;
        ASSERT_EQ(::waitpid(child, &status, 0), child);
        ASSERT_TRUE(WIFEXITED(status) &&
                    (WEXITSTATUS(status) == 0 || WEXITSTATUS(status) == SystemCallFaults::kCrashed));

        const std::optional<std::string> copy = root.content("/to/copy");
        EXPECT_TRUE(!copy || *copy == kContent) << number;
        if (WEXITSTATUS(status) == 0) {
            EXPECT_TRUE(copy);
            EXPECT_GT(number, 10);
            return;
        }
        // What is left over does not keep the next copy from succeeding.
        EXPECT_TRUE(copy || fileSystem.copy("/from/file", "/to/copy")) << number;
        EXPECT_TRUE(fileSystem.remove("/to"));
        root.addDirectory("/to");
    }
}

TEST_F(LocalFileSystemTest, ACopyClearsAwayWhatKilledOnesLeftAndNothingElse) {
    root.addFile("/from/file", kContent);
    root.addDirectory("/to");
    for (const char* const name :
         {".copy-1", ".copy-4294967295", ".copy-", ".copy-x1", "copy-2", ".copy-3.plist"}) {
        root.addFile("/to/" + std::string(name), "left");
    }
    root.addFile("/to/.copy-7", "being written");
    const posix::FileDescriptor writing(::open(root.locate("/to/.copy-7").c_str(), O_RDWR));
    ASSERT_EQ(::flock(writing.get(), LOCK_EX), 0);
    ASSERT_EQ(::symlink("copy-2", root.locate("/to/.copy-8").c_str()), 0);
    ASSERT_EQ(::mkfifo(root.locate("/to/.copy-9").c_str(), 0600), 0);

    EXPECT_TRUE(fileSystem.copy("/from/file", "/to/file"));

    Names left = root.names("/to");
    std::ranges::sort(left);
    EXPECT_EQ(left, (Names{".copy-", ".copy-3.plist", ".copy-7", ".copy-8", ".copy-9", ".copy-x1", "copy-2",
                           "file"}));
}

TEST_F(LocalFileSystemTest, ATextThatCannotBeWrittenWholeLeavesNoNewFile) {
    for (int number = 1;; ++number) {
        SystemCallFaults::failAt(number, ENOSPC);
        const platform::Outcome outcome = fileSystem.writeText("/file", "text");
        const auto calls = static_cast<int>(SystemCallFaults::stop().size());
        if (number > calls) {
            EXPECT_TRUE(outcome);
            EXPECT_GT(number, 2);
            return;
        }
        EXPECT_TRUE(outcome ? root.content("/file") == "text" : root.names("/").empty()) << number;
        static_cast<void>(fileSystem.remove("/file"));
    }
}

TEST_F(LocalFileSystemTest, OfProcessesThatCopyToTheSameNameOneSucceeds) {
    root.addFile("/from/file", kContent);
    root.addDirectory("/to");
    std::vector<pid_t> children;
    for (int index = 0; index < 8; ++index) {
        const pid_t child = ::fork();
        if (child == 0) {
            const platform::Outcome outcome = fileSystem.copy("/from/file", "/to/copy");
            ::_exit(outcome ? 0 : outcome.error.number);
        }
        children.push_back(child);
    }
    int successes = 0;
    for (const pid_t child : children) {
        int status = 0;
        ASSERT_EQ(::waitpid(child, &status, 0), child);
        successes += WEXITSTATUS(status) == 0 ? 1 : 0;
        EXPECT_TRUE(WEXITSTATUS(status) == 0 || WEXITSTATUS(status) == EEXIST) << WEXITSTATUS(status);
    }
    EXPECT_EQ(successes, 1);
    EXPECT_EQ(root.names("/to"), Names{"copy"});
}

TEST_F(LocalFileSystemTest, AFolderIsListedInTheFileSystemsOwnOrder) {
    Names expected;
    for (int index = 0; index < 200; ++index) {
        root.addFile("/folder/" + std::to_string(index * 7919 % 200), "");
    }
    for (const auto& entry : std::filesystem::directory_iterator(root.locate("/folder"))) {
        expected.push_back(entry.path().filename());
    }

    EXPECT_EQ(fileSystem.list("/folder"), expected);
    EXPECT_EQ(expected.size(), 200U);
}

TEST_F(LocalFileSystemTest, AnUnreadableFolderHasNoList) {
    if (::geteuid() != 0) {
        GTEST_SKIP() << "only the superuser can become another user";
    }
    root.addDirectory("/folder");
    ::chmod(root.locate("/folder").c_str(), 0700);
    ::chmod(root.path().c_str(), 0755);
    ASSERT_EQ(::seteuid(1), 0);
    const auto names = fileSystem.list("/folder");
    const platform::Outcome removal = fileSystem.remove("/folder");
    ASSERT_EQ(::seteuid(0), 0);

    EXPECT_EQ(names, std::nullopt);
    EXPECT_EQ(removal.error.number, EACCES);
}

TEST_F(LocalFileSystemTest, AFolderThatCannotBeRemovedWhollyIsAFailure) {
    if (::geteuid() != 0) {
        GTEST_SKIP() << "only the superuser can become another user";
    }
    root.addFile("/folder/inner/file", "text");
    ::chmod(root.locate("/folder").c_str(), 0777);
    ::chmod(root.path().c_str(), 0777);
    ASSERT_EQ(::seteuid(1), 0);
    const platform::Outcome removal = fileSystem.remove("/folder");
    ASSERT_EQ(::seteuid(0), 0);

    EXPECT_EQ(removal.error.number, EACCES);
    EXPECT_EQ(root.content("/folder/inner/file"), "text");
}

// The tests below give the process file systems of its own.
class LocalFileSystemOnDiskTest : public LocalFileSystemTest {
  protected:
    void SetUp() override {
        if (!mayMount()) {
            GTEST_SKIP() << "needs the right to mount";
        }
        enterMountNamespace();
        root.addDirectory("/home");
        mountMemory(root.locate("/home"), "64k");
    }
    void TearDown() override { unmount(root.locate("/home")); }
};

TEST_F(LocalFileSystemOnDiskTest, ACopyToAFullDiskLeavesNothingBehind) {
    root.addFile("/file", kContent);

    const platform::Outcome outcome = fileSystem.copy("/file", "/home/copy");

    EXPECT_EQ(outcome.error.number, ENOSPC);
    EXPECT_EQ(outcome.error.message, "cannot copy /file to /home/copy: No space left on device");
    EXPECT_EQ(root.names("/home"), Names{});
}

TEST_F(LocalFileSystemOnDiskTest, NothingIsChangedOnAReadOnlyDisk) {
    root.addFile("/home/file", "text");
    makeReadOnly(root.locate("/home"));

    EXPECT_EQ(fileSystem.copy("/home/file", "/home/copy").error.number, EROFS);
    EXPECT_EQ(fileSystem.createDirectory("/home/folder", 0755).error.number, EROFS);
    EXPECT_EQ(fileSystem.remove("/home/file").error.number, EROFS);
    EXPECT_EQ(root.names("/home"), Names{"file"});
}

} // namespace welcomer::local
