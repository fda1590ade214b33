// The examples, loaded one by one and as they are installed.

#include "backends/local/LocalFileSystem.h"
#include "backends/local/LocalPluginBundle.h"
#include "plugins/WLNimbusDelegatePlugins.h"
#include "tests/contract/TemporaryRoot.h"
#include "tests/fakes/FakePlatform.h"
#include "tests/unit/plugins/PluginLibrariesFixture.h"

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <memory>
#include <string>

namespace welcomer {
namespace {

class ExamplePlugins : public PluginLibraries {
  protected:
    void SetUp() override {
        const std::string folder = EXAMPLE_PLUGINS;
        add("Vidlink", folder + "/Vidlink.ncdplugin/Vidlink.so");
        add("Chatter", folder + "/Chatter.ncdplugin");
        add("Storefront", folder + "/Storefront.ncdplugin");
        ASSERT_EQ(WLNimbusDelegatePlugins().size(), 3U);
        vidlink = WLNimbusDelegatePlugins()[0];
        chatter = WLNimbusDelegatePlugins()[1];
        storefront = WLNimbusDelegatePlugins()[2];
    }

    // The one outcome of a completion, waited for: success, or the error's text.
    std::string outcome() {
        outcomes->first.get_future().wait();
        const auto [succeeded, error] = outcomes->all.at(0);
        outcomes = std::make_shared<Outcomes>();
        return succeeded ? "completed" : error.value_or(platform::Error{0, "no error"}).message;
    }

    std::shared_ptr<WLFirstRunDelegateConfiguration> vidlink;
    std::shared_ptr<WLFirstRunDelegateConfiguration> chatter;
    std::shared_ptr<WLFirstRunDelegateConfiguration> storefront;
    const PropertyList response =
        PropertyList::Dictionary{{"delaySeconds", 0}, {"aliases", PropertyList::Array{"a", "b"}}};
};

TEST_F(ExamplePlugins, HaveTheirIdentifiersAndNames) {
    EXPECT_EQ(vidlink->delegateIdentifier(), "com.corvid.vidlink");
    EXPECT_EQ(chatter->delegateIdentifier(), "com.corvid.chatter");
    EXPECT_EQ(storefront->delegateIdentifier(), "com.corvid.storefront");
    EXPECT_EQ(vidlink->className(), "Vidlink");
    EXPECT_EQ(chatter->className(), "Chatter");
    EXPECT_EQ(storefront->className(), "Storefront");
}

TEST_F(ExamplePlugins, MakeRequests) {
    EXPECT_EQ(vidlink->delegateSetupRequest(),
              PropertyList(PropertyList::Dictionary{{"protocolVersion", 2}, {"wantsAliases", true}}));
    EXPECT_EQ(chatter->delegateSetupRequest(),
              PropertyList(PropertyList::Dictionary{{"wantsAliases", true}}));
    EXPECT_EQ(storefront->delegateSetupRequest(),
              PropertyList(PropertyList::Dictionary{{"wantsRegion", true}}));
}

TEST_F(ExamplePlugins, CompleteWithTheChosenAliases) {
    vidlink->completeSetupWithResponseChosenAliasesHandler(response, Aliases({"b"}), handler(outcomes));
    EXPECT_EQ(outcome(), "completed");
    vidlink->completeSetupWithResponseChosenAliasesHandler(response, std::nullopt, handler(outcomes));
    EXPECT_EQ(outcome(), "completed");
    chatter->completeSetupWithResponseChosenAliasesHandler(response, Aliases({"b"}), handler(outcomes));
    EXPECT_EQ(outcome(), "completed");
    storefront->completeSetupWithResponseHandler(response, handler(outcomes));
    EXPECT_EQ(outcome(), "completed");
}

TEST_F(ExamplePlugins, SayWhatIsWrong) {
    vidlink->completeSetupWithResponseChosenAliasesHandler(response, Aliases({"c"}), handler(outcomes));
    EXPECT_EQ(outcome(), "the server does not offer c");
    vidlink->completeSetupWithResponseHandler("text", handler(outcomes));
    EXPECT_EQ(outcome(), "the response is no dictionary");
    chatter->completeSetupWithResponseChosenAliasesHandler(response, Aliases({""}), handler(outcomes));
    EXPECT_EQ(outcome(), "an alias is empty");
    chatter->completeSetupWithResponseHandler("text", handler(outcomes));
    EXPECT_EQ(outcome(), "the response is no dictionary");
    storefront->completeSetupWithResponseHandler(
        PropertyList::Dictionary{{"delaySeconds", 0}, {"error", "account on hold"}}, handler(outcomes));
    EXPECT_EQ(outcome(), "account on hold");
    EXPECT_EQ(thrown([&] { storefront->completeSetupWithResponseHandler("text", handler(outcomes)); }),
              "the response is no dictionary");
}

TEST_F(ExamplePlugins, GiveTheAliasesThatTheServerOffers) {
    EXPECT_EQ(vidlink->messagingAliasesFromResponse(response), Aliases({"a", "b"}));
    EXPECT_EQ(chatter->messagingAliasesFromResponse(response), Aliases({"a", "b"}));
    EXPECT_EQ(chatter->messagingAliasesFromResponse({}), std::nullopt);
    EXPECT_EQ(thrown([&] { storefront->messagingAliasesFromResponse(response); }),
              "messagingAliasesFromResponse: is not implemented");
}

// The examples as they are installed, found and loaded from a plug-in directory on disk.
class ExamplePluginsOnDisk : public testing::Test {
  protected:
    ExamplePluginsOnDisk() {
        root.addDirectory(kPluginDirectory);
        for (const char* name : {"Vidlink.ncdplugin", "Chatter.ncdplugin", "Storefront.ncdplugin"}) {
            std::filesystem::copy(std::filesystem::path(EXAMPLE_PLUGINS) / name, locate(name),
                                  std::filesystem::copy_options::recursive);
        }
    }

    std::string locate(const std::string& name) const {
        return root.locate(std::string(kPluginDirectory) + "/" + name);
    }

    static Strings identifiers() {
        Strings found;
        for (const auto& plugin : WLNimbusDelegatePlugins()) {
            found.push_back(plugin->delegateIdentifier().value_or("none"));
        }
        std::sort(found.begin(), found.end());
        return found;
    }

    TemporaryRoot root;
    local::LocalFileSystem files{posix::RootFolder(root.path())};
    local::LocalPluginBundle bundles{posix::RootFolder(root.path())};
    fakes::FakePlatform fake{{.fileSystem = &files, .pluginBundle = &bundles}};
    const platform::ScopedPlatform installed{fake.platform()};
};

TEST_F(ExamplePluginsOnDisk, AreLoadedWhetherTheyAreALibraryOrAFolderWithAnInfoFile) {
    ASSERT_TRUE(std::filesystem::is_directory(locate("Vidlink.ncdplugin")));
    ASSERT_TRUE(std::filesystem::is_regular_file(locate("Chatter.ncdplugin")));
    EXPECT_EQ(identifiers(), (Strings{"com.corvid.chatter", "com.corvid.storefront", "com.corvid.vidlink"}));
    EXPECT_EQ(fake.systemLog.lines(), Strings());
}

TEST_F(ExamplePluginsOnDisk, TheFolderWithoutItsInfoFileIsSkippedAloneWithOneLine) {
    std::filesystem::remove(locate("Vidlink.ncdplugin/Info.plist"));
    EXPECT_EQ(identifiers(), (Strings{"com.corvid.chatter", "com.corvid.storefront"}));
    EXPECT_EQ(fake.systemLog.lines(),
              (Strings{"Nimbus Plugins: Failed to get principal class for Vidlink.ncdplugin"}));
}

TEST_F(ExamplePluginsOnDisk, TheInfoFileNamesTheLibrary) {
    std::filesystem::rename(locate("Vidlink.ncdplugin/Vidlink.so"), locate("Vidlink.ncdplugin/Other.so"));
    EXPECT_EQ(scanDelegatePlugins().size(), 3U);
    EXPECT_EQ(fake.systemLog.lines(),
              (Strings{"Nimbus Plugins: Failed to get principal class for Vidlink.ncdplugin"}));
    std::ofstream(locate("Vidlink.ncdplugin/Info.plist")) << "{ Executable = \"Other.so\"; }";
    EXPECT_EQ(identifiers(), (Strings{"com.corvid.chatter", "com.corvid.storefront", "com.corvid.vidlink"}));
}

} // namespace
} // namespace welcomer
