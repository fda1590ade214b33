#include "backends/local/LocalDirectoryService.h"

#include "tests/fakes/FakeFileSystem.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace welcomer::local {
namespace {

using Names = std::vector<std::string>;

class LocalDirectoryServiceTest : public testing::Test {
  protected:
    Names namesWith(const std::string& text) {
        files.addFile("/etc/nsswitch.conf", text);
        return node()->subnodeNames();
    }
    std::unique_ptr<platform::DirectoryNode> node() {
        return service.openNode(platform::kDirectoryAuthenticationSearchNode);
    }

    fakes::CallRecorder recorder;
    fakes::FakeFileSystem files{recorder};
    LocalDirectoryService service{files};
};

TEST_F(LocalDirectoryServiceTest, TheSubnodesAreTheSourcesOfThePasswdDatabase) {
    EXPECT_EQ(namesWith("group: files\npasswd:\t files  sss ldap\nshadow: files\n"),
              (Names{"files", "sss", "ldap"}));
    EXPECT_EQ(namesWith("  passwd : files"), (Names{"files"}));
    EXPECT_EQ(namesWith("passwd: files # ldap\n#passwd: nis\n"), (Names{"files"}));
    EXPECT_EQ(namesWith("passwd: files [NOTFOUND=return] sss[!UNAVAIL=return]ldap [broken"),
              (Names{"files", "sss", "ldap"}));
    EXPECT_EQ(namesWith("passwd:\n"), Names());
}

TEST_F(LocalDirectoryServiceTest, WithoutALineForPasswdThereIsOnlyTheFile) {
    EXPECT_EQ(node()->subnodeNames(), (Names{"files"}));
    EXPECT_EQ(namesWith("passwd_compat: nis\ngroup: ldap\n"), (Names{"files"}));
}

TEST_F(LocalDirectoryServiceTest, ASourceWhoseModuleDoesNotLoadIsUnreachable) {
    namesWith("passwd: files compat no-such-module ../../tmp/evil");
    EXPECT_EQ(node()->unreachableSubnodeNames(), (Names{"no-such-module", "../../tmp/evil"}));
}

TEST_F(LocalDirectoryServiceTest, OnlyTheSourcesOnThisMachineAreLocal) {
    for (const char* name : {"files", "compat", "db", "systemd"}) {
        EXPECT_TRUE(service.isLocalNodeName(name)) << name;
    }
    for (const char* name : {"sss", "ldap", "nis", "winbind", "Files", ""}) {
        EXPECT_FALSE(service.isLocalNodeName(name)) << name;
    }
}

TEST_F(LocalDirectoryServiceTest, ThereIsNoNodeOfAnotherType) {
    EXPECT_EQ(service.openNode(0x2200), nullptr);
    EXPECT_NE(node(), nullptr);
}

} // namespace
} // namespace welcomer::local
