// What every resource bundle must do.

#include "backends/local/LocalResourceBundles.h"
#include "tests/contract/TemporaryRoot.h"
#include "tests/fakes/FakeResourceBundles.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <string>

namespace welcomer::contract {

namespace {

// Each puts the resources "agent" (no type), "agent" of type "plist" and "with.dot" of type "plist" into the
// bundle "/Setup.app".
struct LocalBundles {
    TemporaryRoot root;
    local::LocalResourceBundles bundles{posix::RootFolder(root.path()), root.locate("/Setup.app")};

    LocalBundles() {
        root.addFile("/Setup.app/Resources/agent", "");
        root.addFile("/Setup.app/Resources/agent.plist", "");
        root.addFile("/Setup.app/Resources/with.dot.plist", "");
        root.addFile("/Setup.app/outside", "");
        root.addFile("/Setup.app/Resources/Localizable.strings", "\"KEY\" = \"A text\"; DATA = <00>;");
    }
};

struct FakeBundles {
    fakes::CallRecorder recorder;
    fakes::FakeResourceBundles bundles{recorder};

    FakeBundles() {
        bundles.add("/Setup.app", "agent", "", "/Setup.app/Resources/agent");
        bundles.add("/Setup.app", "agent", "plist", "/Setup.app/Resources/agent.plist");
        bundles.add("/Setup.app", "with.dot", "plist", "/Setup.app/Resources/with.dot.plist");
        bundles.mainBundleTexts = {{"KEY", "A text"}};
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

TYPED_TEST(ResourceBundleContract, TheMainBundlesTextsAreFoundByTheirKeysAndOthersFallBack) {
    const auto bundle = this->backend.bundles.openMainBundle();

    ASSERT_NE(bundle, nullptr);
    EXPECT_EQ(bundle->localizedString("KEY", "fallback"), "A text");
    EXPECT_EQ(bundle->localizedString("OTHER", "fallback"), "fallback");
    EXPECT_EQ(bundle->localizedString("DATA", ""), "");
    EXPECT_EQ(this->backend.bundles.open("/Other.app")->localizedString("KEY", "fallback"), "fallback");
}

// The languages

class LocalizedStringTest : public testing::Test {
  protected:
    LocalizedStringTest() {
        for (const char* variable : {"LC_ALL", "LC_MESSAGES", "LANG"}) {
            ::unsetenv(variable);
        }
        root.addFile("/App/Resources/Localizable.strings", "A = english; B = english; C = english;");
        root.addFile("/App/Resources/de/Localizable.strings", "A = deutsch; B = deutsch;");
        root.addFile("/App/Resources/de_AT/Localizable.strings", "A = austrian;");
    }

    std::string textsIn(const char* variable, const char* language) {
        ::setenv(variable, language, 1);
        const auto bundle =
            local::LocalResourceBundles(posix::RootFolder("/"), root.locate("/App")).openMainBundle();
        return bundle->localizedString("A", "-") + " " + bundle->localizedString("B", "-") + " " +
               bundle->localizedString("C", "-");
    }

    TemporaryRoot root;
};

TEST_F(LocalizedStringTest, TheLanguageOfTheEnvironmentComesFirstThenItsRelativesThenTheBundlesOwn) {
    EXPECT_EQ(textsIn("LANG", "C"), "english english english");
    EXPECT_EQ(textsIn("LANG", "de_AT.UTF-8"), "austrian deutsch english");
    EXPECT_EQ(textsIn("LC_MESSAGES", "de_DE@euro"), "deutsch deutsch english");
    EXPECT_EQ(textsIn("LC_ALL", "fr_FR"), "english english english");
    EXPECT_EQ(textsIn("LC_ALL", "../../../etc"), "english english english");
    EXPECT_EQ(textsIn("LC_ALL", ""), "deutsch deutsch english");
}

TEST_F(LocalizedStringTest, AnApplicationWithoutAMainBundleHasNoTexts) {
    const auto bundle = local::LocalResourceBundles(posix::RootFolder(root.path())).openMainBundle();
    EXPECT_EQ(bundle->localizedString("A", "-"), "-");
    EXPECT_EQ(bundle->pathForResource("A", ""), std::nullopt);
}

TEST_F(LocalizedStringTest, ATableThatIsNoneHasNoTexts) {
    root.addFile("/App/Resources/Localizable.strings", "\"A\" = ");
    EXPECT_EQ(textsIn("LANG", "C"), "- - -");
}

} // namespace welcomer::contract
