// Plug-ins as their authors build them: real shared libraries, in C and C++, by each compiler that is there.

#include "plugins/WLNimbusDelegatePlugins.h"
#include "tests/unit/plugins/PluginLibrariesFixture.h"

#include <filesystem>
#include <memory>
#include <string>
#include <vector>

namespace welcomer {
namespace {

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

class PluginLibrariesInC : public PluginLibrariesOfACompiler {
  protected:
    // That a plug-in in C does everything that one can.
    void expectWork(const std::string& name);
};

INSTANTIATE_TEST_SUITE_P(Each, PluginLibrariesInC, testing::ValuesIn(compilers()),
                         [](const auto& parameter) { return parameter.param; });

TEST_P(PluginLibrariesInC, DoTheirWork) {
    expectWork("good");
}

TEST_P(PluginLibrariesInC, FromTheFirstHeaderDoTheirWork) {
    expectWork("frozen");
}

void PluginLibrariesInC::expectWork(const std::string& name) {
    const auto plugin = only(name);
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

} // namespace
} // namespace welcomer
