// What every loader of plug-in bundles must do.

#include "backends/local/LocalPluginBundle.h"
#include "tests/contract/TemporaryRoot.h"
#include "tests/fakes/FakePluginBundle.h"

#include <gtest/gtest.h>

#include <filesystem>

namespace welcomer::contract {

namespace {

// Each offers the bundle "/plugins/good.ncdplugin", whose symbol "wl_contract_number" is the number 42, and
// "/plugins/text.ncdplugin", which is no bundle.
struct LocalPlugins {
    TemporaryRoot root;
    local::LocalPluginBundle bundles{posix::RootFolder(root.path())};

    LocalPlugins() {
        root.addFile("/plugins/text.ncdplugin", "text");
        std::filesystem::copy_file(WELCOMER_CONTRACT_LIBRARY, root.locate("/plugins/good.ncdplugin"));
    }
};

struct FakePlugins {
    fakes::CallRecorder recorder;
    fakes::FakePluginBundle bundles{recorder};
    int number = 42;

    FakePlugins() {
        bundles.add("/plugins/good.ncdplugin", "wl_contract_number", &number);
        bundles.addBroken("/plugins/text.ncdplugin", "no library");
    }
};

struct BackendNames {
    template <typename Backend>
    static std::string GetName(int) {
        return std::is_same_v<Backend, LocalPlugins> ? "Local" : "Fake";
    }
};

template <typename Backend>
class PluginBundleContract : public testing::Test {
  protected:
    Backend plugins;
};

using Backends = testing::Types<LocalPlugins, FakePlugins>;
TYPED_TEST_SUITE(PluginBundleContract, Backends, BackendNames);

} // namespace

TYPED_TEST(PluginBundleContract, ASymbolIsFoundAtTheSameAddressEachTime) {
    const platform::PluginSymbol symbol =
        this->plugins.bundles.load("/plugins/good.ncdplugin", "wl_contract_number");

    ASSERT_NE(symbol.address, nullptr) << symbol.reason;
    EXPECT_EQ(*static_cast<const int*>(symbol.address), 42);
    EXPECT_EQ(this->plugins.bundles.load("/plugins/good.ncdplugin", "wl_contract_number").address,
              symbol.address);
}

TYPED_TEST(PluginBundleContract, WhatLacksTheSymbolOrDoesNotLoadSaysWhy) {
    for (const char* path :
         {"/plugins/good.ncdplugin", "/plugins/text.ncdplugin", "/plugins/missing.ncdplugin"}) {
        const platform::PluginSymbol symbol = this->plugins.bundles.load(path, "wl_other_symbol");

        EXPECT_EQ(symbol.address, nullptr) << path;
        EXPECT_FALSE(symbol.reason.empty()) << path;
        EXPECT_EQ(symbol.reason.find('\n'), std::string::npos) << path;
    }
}

} // namespace welcomer::contract
