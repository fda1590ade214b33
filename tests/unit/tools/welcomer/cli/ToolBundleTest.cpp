// What comes with the tool.

#include "tools/welcomer/cli/ToolBundle.h"

#include "backends/local/LocalResourceBundles.h"

#include <gtest/gtest.h>

namespace welcomer::tool {
namespace {

TEST(ToolBundleTest, EveryErrorOfTheNetworkHasATitleAndABody) {
    const std::string folder = findToolBundle();
    ASSERT_NE(folder, "");
    local::LocalResourceBundles bundles{posix::RootFolder("/"), folder};
    for (const char* key :
         {"NETWORKING_MANAGER_NO_INTERNET_TITLE", "NETWORKING_MANAGER_NO_INTERNET_BODY",
          "NETWORKING_MANAGER_GENERIC_ERROR_TITLE", "NETWORKING_MANAGER_GENERIC_ERROR_BODY"}) {
        EXPECT_NE(bundles.openMainBundle()->localizedString(key, ""), "") << key;
    }
}

TEST(ToolBundleTest, TheSetupApplicationsBundleHasTheAgentAndItsLaunchAgent) {
    const std::string folder = findSetupBundle();
    ASSERT_NE(folder, "");
    local::LocalResourceBundles bundles{posix::RootFolder("/"), ""};
    const auto bundle = bundles.open(folder);
    EXPECT_TRUE(bundle->pathForResource("wlnimbussetup", ""));
    EXPECT_TRUE(bundle->pathForResource("com.corvid.welcomer.nimbussetup.user", "plist"));
}

} // namespace
} // namespace welcomer::tool
