// The switch on real files, below a folder that stands for the root of the system.

#include "backends/local/LocalFileSystem.h"
#include "generated/WelcomerConfiguration.h"
#include "switch/SwitchController.h"
#include "tests/contract/TemporaryRoot.h"
#include "tests/fakes/FakePlatform.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <filesystem>
#include <fstream>
#include <string>
#include <sys/stat.h>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>
#include <vector>

namespace welcomer {
namespace {

using Lines = std::vector<std::string>;

const std::string kDirectory = "/etc/resolver";

std::string path(std::size_t index) {
    return kDirectory + "/" + std::string(configuration::kResolverDomains.at(index));
}

class SwitchControllerFilesTest : public testing::Test {
  protected:
    SwitchControllerFilesTest() {
        root.addDirectory("/etc");
        fake.processIdentity.setEffectiveUserID(0);
    }

    // The environment that a new controller finds.
    static std::string found() { return SwitchController().theCurrentServerName().value_or("none"); }

    mode_t mode(const std::string& of) {
        struct stat status = {};
        EXPECT_EQ(::lstat(root.locate(of).c_str(), &status), 0);
        return status.st_mode & 07777;
    }

    TemporaryRoot root;
    local::LocalFileSystem files{posix::RootFolder(root.path())};
    fakes::FakePlatform fake{{.fileSystem = &files}};
    const platform::ScopedPlatform installed{fake.platform()};
};

TEST_F(SwitchControllerFilesTest, SelectsEveryEnvironmentAndReturnsToProduction) {
    SwitchController controller;
    for (const std::uint64_t index : {1U, 8U, 3U}) {
        controller.setSelectedIndex(index);
        EXPECT_EQ(found(), controller.availableServers()[index]);
        EXPECT_EQ(root.names(kDirectory).size(), 4U);
    }
    EXPECT_EQ(root.content(path(1)), "# Switch override for Nimbus\ndomain " +
                                         std::string(configuration::kResolverDomains[1]) + "\nnameserver " +
                                         std::string(configuration::kTestNameservers[2]) + "\n");
    controller.setSelectedIndex(0);
    EXPECT_FALSE(std::filesystem::exists(root.locate(kDirectory)));
    EXPECT_EQ(found(), "Prod");
}

TEST_F(SwitchControllerFilesTest, EveryUsersResolverCanReadTheOverrides) {
    const mode_t before = ::umask(077);
    SwitchController().setSelectedIndex(1);
    ::umask(before);
    EXPECT_EQ(mode(kDirectory), 0755U);
    EXPECT_EQ(mode(path(0)), 0644U);
}

TEST_F(SwitchControllerFilesTest, RemovesFoldersInTheFolderToo) {
    root.addFile(kDirectory + "/a/b/c", "deep");
    SwitchController().setSelectedIndex(1);
    EXPECT_EQ(root.names(kDirectory).size(), 4U);
}

TEST_F(SwitchControllerFilesTest, NeverFollowsASymbolicLinkOutOfTheFolder) {
    root.addFile("/outside/file", "kept");
    root.addDirectory(kDirectory + "/inner");
    std::filesystem::create_directory_symlink(root.locate("/outside"), root.locate(kDirectory + "/link"));
    std::filesystem::create_directory_symlink("../../../outside", root.locate(kDirectory + "/inner/link"));
    std::filesystem::create_symlink(root.locate("/outside/file"), root.locate(path(0)));
    SwitchController().setSelectedIndex(1);
    EXPECT_EQ(root.content("/outside/file"), "kept");
    EXPECT_EQ(root.names(kDirectory).size(), 4U);
    EXPECT_FALSE(std::filesystem::is_symlink(root.locate(path(0))));
}

TEST_F(SwitchControllerFilesTest, AFolderThatIsASymbolicLinkIsRemovedItselfAlone) {
    root.addFile("/outside/file", "kept");
    std::filesystem::create_directory_symlink(root.locate("/outside"), root.locate(kDirectory));
    SwitchController().setSelectedIndex(1);
    EXPECT_EQ(root.names("/outside"), (Lines{"file"}));
    EXPECT_EQ(root.content("/outside/file"), "kept");
    EXPECT_FALSE(std::filesystem::is_symlink(root.locate(kDirectory)));
    EXPECT_EQ(root.names(kDirectory).size(), 4U);
}

TEST_F(SwitchControllerFilesTest, AFileInPlaceOfTheFolderIsRemovedToo) {
    root.addFile(kDirectory, "no folder");
    SwitchController().setSelectedIndex(1);
    EXPECT_EQ(found(), "Nimbus1");
}

TEST_F(SwitchControllerFilesTest, AnOverrideOfAGigabyteIsUnreadableAndMeansProduction) {
    root.addFile(path(3), "nameserver 192.0.2.1\n");
    EXPECT_EQ(found(), "Nimbus1");
    std::filesystem::resize_file(root.locate(path(3)), std::uintmax_t{1} << 30);
    EXPECT_EQ(found(), "Prod");
}

TEST_F(SwitchControllerFilesTest, WhatIsNoTextFileMeansProduction) {
    root.addFile(path(3), "nameserver 192.0.2.1\n# \xc3\x28\n");
    EXPECT_EQ(found(), "Prod");
    std::filesystem::remove(root.locate(path(3)));
    root.addDirectory(path(3));
    EXPECT_EQ(found(), "Prod");
    std::filesystem::remove(root.locate(path(3)));
    ASSERT_EQ(::mkfifo(root.locate(path(3)).c_str(), 0644), 0);
    EXPECT_EQ(found(), "Prod"); // and does not wait for a writer
}

// Whether an ordinary user's controller finds an environment; asked in a process of its own.
bool ordinaryUserFinds(const std::string& name) {
    const pid_t child = ::fork();
    if (child == 0) {
        constexpr uid_t kNobody = 65534;
        const bool isOrdinary = ::geteuid() != 0 || ::seteuid(kNobody) == 0;
        ::_exit(isOrdinary && SwitchController().theCurrentServerName() == name ? 0 : 1);
    }
    int status = 1;
    return ::waitpid(child, &status, 0) == child && status == 0;
}

TEST_F(SwitchControllerFilesTest, AnUnreadableFolderMeansProduction) {
    root.addFile(path(3), "nameserver 192.0.2.1\n");
    std::filesystem::permissions(root.path(), std::filesystem::perms{0755});
    EXPECT_TRUE(ordinaryUserFinds("Nimbus1"));
    std::filesystem::permissions(root.locate(kDirectory), std::filesystem::perms{0});
    EXPECT_TRUE(ordinaryUserFinds("Prod"));
    std::filesystem::permissions(root.locate(kDirectory), std::filesystem::perms{0755});
}

TEST_F(SwitchControllerFilesTest, TwoControllersAtOnceFailWithTheirOwnLinesOrSucceed) {
    constexpr int kRounds = 200;
    const auto work = [](std::uint64_t first, std::uint64_t second) {
        SwitchController controller;
        for (int round = 0; round < kRounds; ++round) {
            controller.setSelectedIndex(round % 2 == 0 ? first : second);
        }
    };
    std::thread other(work, 1, 0);
    work(5, 8);
    other.join();

    const Lines lines = fake.systemLog.lines();
    const Lines expected = {
        "SwitchController thinks we are pointed to ",
        "SwitchController redirected to ",
        "SwitchController returned to prod",
        "SwitchController failed to remove previous config: ",
        "SwitchController failed to write /etc/resolver/",
        "SwitchController failed to create /etc/resolver: ",
        "SwitchController isn't smart enough to parse:\n",
    };
    for (const std::string& line : lines) {
        EXPECT_TRUE(std::ranges::any_of(expected, [&](const auto& each) { return line.starts_with(each); }))
            << line;
    }
    SwitchController last;
    last.setSelectedIndex(last.theCurrentServerName() == "Q2" ? 7 : 6);
    EXPECT_EQ(found(), last.theCurrentServerName());
    EXPECT_EQ(root.names(kDirectory).size(), 4U);
}

} // namespace
} // namespace welcomer
