// Plug-ins as their authors build them: real shared libraries, in C and C++, by each compiler that is there.

#include "backends/local/LocalFileSystem.h"
#include "backends/local/LocalPluginBundle.h"
#include "plugins/AbiDelegatePlugin.h"
#include "plugins/WLNimbusDelegatePlugins.h"
#include "tests/contract/TemporaryRoot.h"
#include "tests/fakes/FakePlatform.h"

#include <algorithm>
#include <dlfcn.h>
#include <filesystem>
#include <fstream>
#include <functional>
#include <future>
#include <gtest/gtest.h>
#include <memory>
#include <string>
#include <unistd.h>
#include <vector>

namespace welcomer {
namespace {

using Strings = std::vector<std::string>;
using Aliases = std::optional<Strings>;

class PluginLibraries : public testing::Test {
  protected:
    // Puts a file into the plug-in directory, after those before, and loads it.
    void add(const std::string& name, const std::string& file) {
        const std::string path = std::string(kPluginDirectory) + "/" + name + ".ncdplugin";
        fake.fileSystem.addFile(path, "");
        void* const library = dlopen(file.c_str(), RTLD_NOW | RTLD_LOCAL);
        if (const void* const symbol = library ? dlsym(library, "wl_delegate_plugin") : nullptr) {
            fake.pluginBundle.add(path, "wl_delegate_plugin", symbol);
        } else {
            fake.pluginBundle.addBroken(path, dlerror());
        }
    }

    std::shared_ptr<WLFirstRunDelegateConfiguration> only() {
        const DelegatePluginArray& plugins = WLNimbusDelegatePlugins();
        EXPECT_EQ(fake.systemLog.lines(), Strings{});
        EXPECT_EQ(plugins.size(), 1U);
        return plugins.at(0);
    }

    static std::string thrown(const std::function<void()>& call) {
        try {
            call();
        } catch (const DelegatePluginException& exception) {
            return exception.what();
        } catch (...) {
            ADD_FAILURE() << "threw something else";
        }
        return "nothing thrown";
    }

    // The outcomes that a plug-in's handler gave; kept by the handler.
    struct Outcomes {
        std::promise<void> first;
        std::vector<std::pair<bool, std::optional<platform::Error>>> all;
    };

    static WLFirstRunDelegateConfiguration::CompletionHandler handler(std::shared_ptr<Outcomes> outcomes) {
        return [outcomes](bool succeeded, const std::optional<platform::Error>& error) {
            outcomes->all.emplace_back(succeeded, error);
            if (outcomes->all.size() == 1) {
                outcomes->first.set_value();
            }
        };
    }

    fakes::FakePlatform fake;
    platform::ScopedPlatform installed{fake.platform()};
    std::shared_ptr<Outcomes> outcomes = std::make_shared<Outcomes>();
};

std::vector<std::string> compilers() {
    std::vector<std::string> found;
    for (const char* compiler : {"gcc", "clang"}) {
        if (std::filesystem::exists(std::string(FIXTURE_PLUGINS) + "/" + compiler + "/good.ncdplugin")) {
            found.emplace_back(compiler);
        }
    }
    return found;
}

class PluginLibrariesOfACompiler : public PluginLibraries, public testing::WithParamInterface<std::string> {
  protected:
    static std::string file(const std::string& name) {
        return std::string(FIXTURE_PLUGINS) + "/" + GetParam() + "/" + name + ".ncdplugin";
    }

    void addFixture(const std::string& name) { add(name, file(name)); }

    std::shared_ptr<WLFirstRunDelegateConfiguration> only(const std::string& name) {
        addFixture(name);
        return PluginLibraries::only();
    }
};

INSTANTIATE_TEST_SUITE_P(Each, PluginLibrariesOfACompiler, testing::ValuesIn(compilers()),
                         [](const auto& parameter) { return parameter.param; });

TEST_P(PluginLibrariesOfACompiler, AreSkippedWhenTheyBreakARuleAndDoNotHarmTheOthers) {
    for (const char* name :
         {"no-symbol", "other-version", "other-protocol", "creates-nothing", "raises-create", "throws-create",
          "layer-throws-create", "no-identifier", "raises-identifier", "throws-identifier",
          "layer-throws-identifier", "layer-nul-identifier", "good", "layer"}) {
        addFixture(name);
    }
    add("no-library", "/dev/null");
    const DelegatePluginArray& plugins = WLNimbusDelegatePlugins();
    ASSERT_EQ(plugins.size(), 1U);
    EXPECT_EQ(plugins[0]->delegateIdentifier(), "com.corvid.fixture");
    EXPECT_EQ(plugins[0]->className(), "Fixture"); // the earlier of the two
    EXPECT_EQ(
        fake.systemLog.lines(),
        (Strings{
            "Nimbus Plugins: Failed to get principal class for no-symbol.ncdplugin",
            "Nimbus Plugins: Failed to get principal class for other-version.ncdplugin",
            "Nimbus Plugins: Principal class for other-protocol.ncdplugin does not conform to protocol",
            "Nimbus Plugins: Failed to init plugin object for creates-nothing.ncdplugin",
            "Nimbus Plugins: Failed to init plugin object for raises-create.ncdplugin",
            "Nimbus Plugins: Failed to init plugin object for throws-create.ncdplugin",
            "Nimbus Plugins: Failed to init plugin object for layer-throws-create.ncdplugin",
            "Nimbus Plugins: 'no-identifier.ncdplugin' does not specify a plugin identifier",
            "Nimbus Plugins: Exception querying 'raises-identifier.ncdplugin' for id on load: raised in "
            "delegateIdentifier",
            "Nimbus Plugins: Exception querying 'throws-identifier.ncdplugin' for id on load: raised in "
            "delegateIdentifier",
            "Nimbus Plugins: Exception querying 'layer-throws-identifier.ncdplugin' for id on load: thrown "
            "in "
            "delegateIdentifier",
            "Nimbus Plugins: Exception querying 'layer-nul-identifier.ncdplugin' for id on load: "
            "delegateIdentifier returned a NUL",
            "Nimbus Plugins: duplicate plugins with id 'com.corvid.fixture', only one will be used",
            "Nimbus Plugins: Failed to get principal class for no-library.ncdplugin",
        }));
}

TEST_P(PluginLibrariesOfACompiler, InCDoTheirWork) {
    const auto plugin = only("good");
    EXPECT_EQ(plugin->delegateSetupRequest(), PropertyList(PropertyList::Dictionary{{"number", 7}}));
    EXPECT_EQ(plugin->messagingAliasesFromResponse({}), Aliases({"ann@example.com"}));
    plugin->completeSetupWithResponseHandler("succeed", handler(outcomes));
    plugin->completeSetupWithResponseChosenAliasesHandler({}, Aliases({"a", "b"}), handler(outcomes));
    plugin->completeSetupWithResponseChosenAliasesHandler({}, std::nullopt, handler(outcomes));
    plugin->completeSetupWithResponseHandler(7, handler(outcomes));
    ASSERT_EQ(outcomes->all.size(), 4U);
    EXPECT_TRUE(outcomes->all[0].first);
    EXPECT_TRUE(outcomes->all[1].first);
    EXPECT_FALSE(outcomes->all[2].first);
    EXPECT_EQ(outcomes->all[2].second, std::nullopt);
    EXPECT_EQ(outcomes->all[3].second, (platform::Error{22, "the response is no string"}));
}

TEST_P(PluginLibrariesOfACompiler, OverTheLayerDoTheirWork) {
    const auto plugin = only("layer");
    EXPECT_EQ(plugin->className(), "PlainDelegate");
    const PropertyList::Array list = {
        "text", 1, 2, 1.5, true, PropertyList::Data{"bytes"}, PropertyList::Date{86400}};
    EXPECT_EQ(plugin->delegateSetupRequest(), PropertyList(PropertyList::Dictionary{{"list", list}}));
    plugin->completeSetupWithResponseHandler(PropertyList::Dictionary{{"a", "x"}, {"b", 1}},
                                             handler(outcomes));
    ASSERT_EQ(outcomes->all.size(), 1U);
    EXPECT_FALSE(outcomes->all[0].first);
    EXPECT_EQ(outcomes->all[0].second, (platform::Error{17, "a=x;b=?;"}));
}

TEST_P(PluginLibrariesOfACompiler, OverTheLayerRaiseWhereNothingIsOverriddenButNotForTheTermination) {
    const auto plugin = only("layer");
    EXPECT_NO_THROW(plugin->terminateSetupCompletion());
    EXPECT_EQ(thrown([&] { plugin->messagingAliasesFromResponse({}); }),
              "messagingAliasesFromResponse: is not implemented");
    EXPECT_EQ(thrown([&] {
                  plugin->completeSetupWithResponseChosenAliasesHandler({}, std::nullopt, handler(outcomes));
              }),
              "completeSetupWithResponse:chosenAliases:handler: is not implemented");
    EXPECT_TRUE(outcomes->all.empty());
}

TEST_P(PluginLibrariesOfACompiler, OverTheLayerRaiseWhatTheyThrowInEveryOperation) {
    const auto plugin = only("layer-throws");
    EXPECT_EQ(thrown([&] { plugin->delegateSetupRequest(); }), "std::bad_alloc");
    EXPECT_EQ(thrown([&] { plugin->completeSetupWithResponseHandler({}, handler(outcomes)); }),
              "unknown exception");
    EXPECT_EQ(thrown([&] { plugin->terminateSetupCompletion(); }), "thrown in terminate");
    EXPECT_EQ(thrown([&] {
                  plugin->completeSetupWithResponseChosenAliasesHandler({}, std::nullopt, handler(outcomes));
              }),
              "thrown in chosenAliases");
    EXPECT_EQ(thrown([&] { plugin->messagingAliasesFromResponse({}); }), "a value that cannot be built");
}

TEST_P(PluginLibrariesOfACompiler, RaiseInEveryOperation) {
    for (const char* name : {"raises-operations", "throws-operations"}) {
        addFixture(name);
        const auto entries = scanDelegatePlugins();
        const auto plugin = entries.at(0).plugin;
        ASSERT_NE(plugin, nullptr);
        EXPECT_EQ(thrown([&] { plugin->delegateSetupRequest(); }), "raised in delegateSetupRequest");
        EXPECT_EQ(thrown([&] { plugin->completeSetupWithResponseHandler({}, handler(outcomes)); }),
                  "raised in completeSetupWithResponse");
        EXPECT_EQ(thrown([&] {
                      plugin->completeSetupWithResponseChosenAliasesHandler({}, std::nullopt,
                                                                            handler(outcomes));
                  }),
                  "raised in chosenAliases");
        EXPECT_EQ(thrown([&] { plugin->terminateSetupCompletion(); }), "raised in terminateSetupCompletion");
        EXPECT_EQ(thrown([&] { plugin->messagingAliasesFromResponse({}); }),
                  "raised in messagingAliasesFromResponse");
        fake.fileSystem.addDirectory(kPluginDirectory);
    }
}

TEST_P(PluginLibrariesOfACompiler, MayThrowWhatIsNoException) {
    const auto plugin = only("throws-numbers");
    EXPECT_EQ(thrown([&] { plugin->delegateSetupRequest(); }), "unknown exception");
    EXPECT_EQ(thrown([&] { plugin->completeSetupWithResponseHandler({}, handler(outcomes)); }),
              "unknown exception");
}

TEST_P(PluginLibrariesOfACompiler, MayCallTheHandlerTwice) {
    only("good")->completeSetupWithResponseHandler("twice", handler(outcomes));
    ASSERT_EQ(outcomes->all.size(), 1U);
    EXPECT_TRUE(outcomes->all[0].first);
}

TEST_P(PluginLibrariesOfACompiler, MayCallTheHandlerFromAnotherThread) {
    only("good")->completeSetupWithResponseHandler("other thread", handler(outcomes));
    EXPECT_EQ(outcomes->all.size(), 1U);
}

TEST_P(PluginLibrariesOfACompiler, MayCallTheHandlerAfterTheirCallHasReturned) {
    only("good")->completeSetupWithResponseHandler("after return", handler(outcomes));
    outcomes->first.get_future().wait();
    EXPECT_EQ(outcomes->all.size(), 1U);
}

TEST_P(PluginLibrariesOfACompiler, MayNeverCallTheHandlerUntilMuchLater) {
    const auto plugin = only("good");
    plugin->completeSetupWithResponseHandler("never", handler(outcomes));
    EXPECT_TRUE(outcomes->all.empty());
    plugin->terminateSetupCompletion(); // calls the handler that was kept
    EXPECT_EQ(outcomes->all.size(), 1U);
    plugin->terminateSetupCompletion();
    EXPECT_EQ(outcomes->all.size(), 1U);
}

TEST_P(PluginLibrariesOfACompiler, CallTheirHandlerInVainAfterTheyRaised) {
    const auto plugin = only("good");
    EXPECT_EQ(thrown([&] { plugin->completeSetupWithResponseHandler("raise then call", handler(outcomes)); }),
              "raised before the handler");
    plugin->terminateSetupCompletion(); // calls the handler that was kept
    EXPECT_TRUE(outcomes->all.empty());
}

TEST_P(PluginLibrariesOfACompiler, HaveCompletedWhenTheyRaiseAfterTheHandler) {
    const auto plugin = only("good");
    EXPECT_EQ(thrown([&] { plugin->completeSetupWithResponseHandler("then raise", handler(outcomes)); }),
              "raised after the handler");
    EXPECT_EQ(outcomes->all.size(), 1U);
}

TEST_F(PluginLibraries, AreTestedWithBothCompilers) {
    if (compilers().size() < 2 && geteuid() != 0) {
        GTEST_SKIP() << "needs gcc with g++, and clang"; // where everything is tested, both must be there
    }
    EXPECT_EQ(compilers(), (Strings{"gcc", "clang"}));
}

TEST_F(PluginLibraries, OfBothCompilersAndBothLanguagesShareAProcess) {
    // Each is a library of its own with symbols of the same names.
    for (const std::string& compiler : compilers()) {
        for (const char* name : {"layer", "good", "raises-operations", "layer-throws"}) {
            fake.fileSystem.addDirectory(kPluginDirectory);
            add(name, std::string(FIXTURE_PLUGINS) + "/" + compiler + "/" + name + ".ncdplugin");
            const auto entries = scanDelegatePlugins();
            ASSERT_EQ(entries.size(), 1U);
            ASSERT_NE(entries[0].plugin, nullptr) << entries[0].reason;
            EXPECT_EQ(entries[0].identifier, "com.corvid.fixture");
        }
    }
}

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
