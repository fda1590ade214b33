// What every source of the system's version does.

#include "backends/local/LocalFileSystem.h"
#include "backends/local/LocalSystemVersionInfo.h"
#include "tests/contract/TemporaryRoot.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <optional>
#include <string>
#include <utility>
#include <vector>

namespace welcomer {
namespace {

class SystemVersionInfoTest : public testing::Test {
  protected:
    TemporaryRoot root;
    local::LocalFileSystem fileSystem{posix::RootFolder(root.path())};
    local::LocalSystemVersionInfo info{fileSystem};
};

TEST_F(SystemVersionInfoTest, GivesTheVersionOfTheSystem) {
    root.addFile("/etc/os-release", "NAME=\"System\"\nVERSION_ID=\"12\"\nVERSION=\"12 (name)\"\n");
    EXPECT_EQ(info.productVersion(), "12");
}

TEST_F(SystemVersionInfoTest, UnderstandsEveryWayOfQuoting) {
    const std::vector<std::pair<std::string, std::optional<std::string>>> cases = {
        {"VERSION_ID=12\n", "12"},
        {"VERSION_ID='24.04'\n", "24.04"},
        {"VERSION_ID=\"12\" \r\n", "12"},
        {"VERSION_ID=\"1\\\"2\"", "1\"2"},
        {"VERSION_ID='1\\2'", "1\\2"},
        {"VERSION_ID=1\nVERSION_ID=2\n", "2"},
        {"#VERSION_ID=1\n VERSION_ID=2\nMY_VERSION_ID=3\n", std::nullopt},
        {"VERSION_ID=\n", std::nullopt},
        {"VERSION_ID=\"\"\n", std::nullopt},
        {"VERSION_ID=\"", "\""},
        {"", std::nullopt},
    };
    for (const auto& [text, version] : cases) {
        root.addFile("/etc/os-release", text);
        EXPECT_EQ(info.productVersion(), version) << text;
    }
}

TEST_F(SystemVersionInfoTest, FallsBackToTheVendorsFile) {
    root.addFile("/usr/lib/os-release", "VERSION_ID=11\n");
    EXPECT_EQ(info.productVersion(), "11");
    root.addFile("/etc/os-release", "NAME=rolling\n");
    EXPECT_EQ(info.productVersion(), std::nullopt);
}

TEST_F(SystemVersionInfoTest, FollowsTheUsualLinkToTheVendorsFile) {
    root.addFile("/usr/lib/os-release", "VERSION_ID=11\n");
    root.addDirectory("/etc");
    std::filesystem::create_symlink("../usr/lib/os-release", root.locate("/etc/os-release"));
    EXPECT_EQ(info.productVersion(), "11");
}

TEST_F(SystemVersionInfoTest, ASystemWithoutTheFilesDoesNotSay) {
    EXPECT_EQ(info.productVersion(), std::nullopt);
}

} // namespace
} // namespace welcomer
