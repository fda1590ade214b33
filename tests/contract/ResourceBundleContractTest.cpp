// What every resource bundle must do.

#include "backends/local/LocalResourceBundles.h"
#include "tests/contract/TemporaryRoot.h"
#include "tests/fakes/FakeResourceBundles.h"

#include <gtest/gtest.h>

namespace welcomer::contract {

namespace {

// Each puts the resources "agent" (no type), "agent" of type "plist" and "with.dot" of type "plist" into the
// bundle "/Setup.app".
struct LocalBundles {
    TemporaryRoot root;
    local::LocalResourceBundles bundles{local::RootFolder(root.path())};

    LocalBundles() {
        root.addFile("/Setup.app/Resources/agent", "");
        root.addFile("/Setup.app/Resources/agent.plist", "");
        root.addFile("/Setup.app/Resources/with.dot.plist", "");
        root.addFile("/Setup.app/outside", "");
    }
};

struct FakeBundles {
    fakes::CallRecorder recorder;
    fakes::FakeResourceBundles bundles{recorder};

    FakeBundles() {
        bundles.add("/Setup.app", "agent", "", "/Setup.app/Resources/agent");
        bundles.add("/Setup.app", "agent", "plist", "/Setup.app/Resources/agent.plist");
        bundles.add("/Setup.app", "with.dot", "plist", "/Setup.app/Resources/with.dot.plist");
    }
};

struct BackendNames {
    template <typename Backend>
    static std::string GetName(int) {
        return std::is_same_v<Backend, LocalBundles> ? "Local" : "Fake";
    }
};

template <typename Backend>
class ResourceBundleContract : public testing::Test {
  protected:
    Backend backend;
};

using Backends = testing::Types<LocalBundles, FakeBundles>;
TYPED_TEST_SUITE(ResourceBundleContract, Backends, BackendNames);

} // namespace

TYPED_TEST(ResourceBundleContract, AResourceIsFoundByNameAndType) {
    const auto bundle = this->backend.bundles.open("/Setup.app");

    EXPECT_EQ(bundle->pathForResource("agent", ""), "/Setup.app/Resources/agent");
    EXPECT_EQ(bundle->pathForResource("agent", "plist"), "/Setup.app/Resources/agent.plist");
    EXPECT_EQ(bundle->pathForResource("with.dot", "plist"), "/Setup.app/Resources/with.dot.plist");
}

TYPED_TEST(ResourceBundleContract, WhatTheBundleDoesNotHaveIsNotFound) {
    const auto bundle = this->backend.bundles.open("/Setup.app");

    EXPECT_EQ(bundle->pathForResource("other", ""), std::nullopt);
    EXPECT_EQ(bundle->pathForResource("agent", "txt"), std::nullopt);
    EXPECT_EQ(bundle->pathForResource("outside", ""), std::nullopt);
    EXPECT_EQ(bundle->pathForResource("", "plist"), std::nullopt);
    EXPECT_EQ(bundle->pathForResource("", ""), std::nullopt);
}

TYPED_TEST(ResourceBundleContract, ABundleThatDoesNotExistHasNoResources) {
    const auto bundle = this->backend.bundles.open("/Other.app");

    ASSERT_NE(bundle, nullptr);
    EXPECT_EQ(bundle->pathForResource("agent", ""), std::nullopt);
}

} // namespace welcomer::contract
