#include "backends/local/PluginFolder.h"

#include "backends/local/LocalFileSystem.h"
#include "backends/local/LocalPluginBundle.h"
#include "platform/PluginDirectory.h"
#include "tests/contract/TemporaryRoot.h"

#include <gtest/gtest.h>

#include <filesystem>

namespace welcomer::local {

namespace {

constexpr char kPackages[] = "/usr/lib/welcomer/plugins";
const std::string kGiven = platform::kPluginDirectory;

class PluginFolderTest : public testing::Test {
  protected:
    void addLibrary(const std::string& path) {
        std::filesystem::create_directories(std::filesystem::path(root.locate(path)).parent_path());
        std::filesystem::copy_file(WELCOMER_CONTRACT_LIBRARY, root.locate(path));
    }

    TemporaryRoot root;
    const posix::RootFolder below{root.path()};
    const PluginFolder folder{below, [] {
                                  return std::string(kPackages);
                              }};
    LocalFileSystem files{below, folder};
    LocalPluginBundle bundles{below, folder};
};

} // namespace

TEST_F(PluginFolderTest, WithoutTheGivenDirectoryThatOfPackagesServes) {
    EXPECT_EQ(folder.serving(), kPackages);
    EXPECT_EQ(folder.located(kGiven), kPackages);
    EXPECT_EQ(folder.located(kGiven + "/a.ncdplugin"), std::string(kPackages) + "/a.ncdplugin");
}

TEST_F(PluginFolderTest, TheGivenDirectoryServesAloneWhereItExistsEvenWhenItIsEmpty) {
    root.addFile(std::string(kPackages) + "/a.ncdplugin", "");
    root.addDirectory(kGiven);
    EXPECT_EQ(folder.serving(), kGiven);
    EXPECT_EQ(folder.located(kGiven + "/a.ncdplugin"), kGiven + "/a.ncdplugin");
    EXPECT_EQ(files.list(kGiven), std::vector<std::string>());
}

TEST_F(PluginFolderTest, OtherPathsAreLeftAsTheyAre) {
    for (const std::string& path : {std::string("/"), std::string("/etc"), kGiven + "2", kGiven + "2/a",
                                    "/other" + kGiven, std::string(kPackages)}) {
        EXPECT_EQ(folder.located(path), path);
    }
}

TEST_F(PluginFolderTest, PluginsOfPackagesAreListedAndLoadedByTheGivenPath) {
    addLibrary(std::string(kPackages) + "/a.ncdplugin");
    EXPECT_EQ(files.list(kGiven), std::vector<std::string>{"a.ncdplugin"});
    const platform::PluginSymbol symbol = bundles.load(kGiven + "/a.ncdplugin", "wl_contract_number");
    EXPECT_NE(symbol.address, nullptr) << symbol.reason;
}

TEST_F(PluginFolderTest, WithNeitherThereIsNoDirectory) {
    EXPECT_EQ(files.list(kGiven), std::nullopt);
}

} // namespace welcomer::local
