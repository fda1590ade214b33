// The request that is sent for all delegates.

#include "plugins/WLNimbusDelegatesRequest.h"
#include "plugins/AbiDelegatePlugin.h"
#include "plugins/PropertyListHandles.h"
#include "propertylist/PropertyListReader.h"
#include "propertylist/PropertyListWriter.h"
#include "tests/fakes/PluginRegistry.h"
#include "tests/unit/plugins/InProcessPlugin.h"
#include "tests/unit/plugins/WLNimbusDelegatesRequestFixture.h"

#include <stdexcept>
#include <string>

namespace welcomer {
namespace {

TEST_F(WLNimbusDelegatesRequestTest, WithoutPluginsItHoldsTheFormerOnlineServiceAlone) {
    EXPECT_EQ(request(), (Dictionary{{kSkylark, none}}));
    EXPECT_EQ(lines(), Strings{});
}

TEST_F(WLNimbusDelegatesRequestTest, HoldsTheRequestOfEveryPlugin) {
    add("com.corvid.vidlink");
    add("com.corvid.storefront").request = [] {
        return std::optional<PropertyList>("not a dictionary");
    };
    EXPECT_EQ(request(), (Dictionary{{kSkylark, none},
                                     {"com.corvid.vidlink", own},
                                     {"com.corvid.storefront", "not a dictionary"}}));
    EXPECT_EQ(lines(), Strings{});
}

// Dictionaries within one another, the innermost empty.
wl_value* nestedRequest(int depth) {
    const wl_host& host = delegatePluginHost();
    wl_value* value = host.new_dictionary();
    for (int level = 1; level < depth; ++level) {
        wl_value* outer = host.new_dictionary();
        EXPECT_TRUE(host.dictionary_set(outer, "k", 1, value)) << level;
        value = outer;
    }
    return value;
}

TEST_F(WLNimbusDelegatesRequestTest, ARequestOfTheGreatestDepthCanBeWrittenAndReadBack) {
    fakes::InProcessPlugin deepest{"com.corvid.deep"};
    deepest.request = [](wl_error_slot*) {
        return nestedRequest(WL_VALUE_DEPTH_LIMIT);
    };
    fakes::fillPluginRegistry({AbiDelegatePlugin::create(*deepest.exportAs<0>(), "Deep.ncdplugin")});
    const PropertyList whole = WLNimbusDelegatesRequest({}, {});
    EXPECT_TRUE(delegates(*whole.dictionary()).contains("com.corvid.deep"));
    std::string error;
    const std::optional<std::string> written = writeXMLPropertyList(whole, &error);
    ASSERT_TRUE(written) << error;
    EXPECT_EQ(readPropertyList(*written).value, whole);
    EXPECT_EQ(lines(), Strings{});

    // The server's answer, as deep as the request, is wrapped once more for the replay item.
    const PropertyList replay = Dictionary{{"delegatesResponseDict", whole}};
    EXPECT_EQ(readPropertyList(writeXMLPropertyList(replay).value_or("")).value, replay);
}

TEST_F(WLNimbusDelegatesRequestTest, AnOmittedPluginIsNotAskedAndNotLogged) {
    RequestingPlugin& omitted = add("com.corvid.vidlink");
    add("com.corvid.chatter");
    EXPECT_EQ(request({}, {"com.corvid.vidlink", "com.corvid.unknown"}),
              (Dictionary{{kSkylark, none}, {"com.corvid.chatter", own}}));
    EXPECT_EQ(omitted.requests, 0);
    EXPECT_EQ(lines(), Strings{});
}

TEST_F(WLNimbusDelegatesRequestTest, APluginWithoutARequestOmitsItselfWithALogLine) {
    add("com.corvid.vidlink").request = [] {
        return std::optional<PropertyList>();
    };
    EXPECT_EQ(request(), (Dictionary{{kSkylark, none}}));
    EXPECT_EQ(lines(), Strings{"Nimbus Plugins: Delegate com.corvid.vidlink omits itself from Nimbus setup"});
}

TEST_F(WLNimbusDelegatesRequestTest, AnIdentifierIsOneLineOfTheLogWhateverIsInIt) {
    add("a\nforged").request = [] {
        return std::optional<PropertyList>();
    };
    RequestingPlugin& raising = add("b\nforged");
    raising.request = []() -> std::optional<PropertyList> {
        throw std::runtime_error("no request");
    };
    raising.aliases = [](const PropertyList&) -> std::optional<Strings> {
        throw std::runtime_error("no aliases");
    };
    request();
    WLNimbusGetMessagingAliasesFromDelegateResponse("b\nforged", Dictionary());
    EXPECT_EQ(lines(),
              (Strings{R"(Nimbus Plugins: Delegate a\nforged omits itself from Nimbus setup)",
                       R"(Nimbus Plugins: Exception querying 'b\nforged' for setup request: no request)",
                       R"(Nimbus Plugins: Exception querying 'b\nforged' for aliases: no aliases)"}));
}

TEST_F(WLNimbusDelegatesRequestTest, AnEmptyDictionaryIsARequest) {
    add("com.corvid.vidlink").request = [] {
        return std::optional<PropertyList>(Dictionary{});
    };
    EXPECT_EQ(request(), (Dictionary{{kSkylark, none}, {"com.corvid.vidlink", none}}));
    EXPECT_EQ(lines(), Strings{});
}

TEST_F(WLNimbusDelegatesRequestTest, APluginThatRaisesOnItsIdentifierIsUnknownAndTheNextIsAsked) {
    RequestingPlugin& raising = add("a");
    raising.identify = []() -> Identifier {
        throw std::runtime_error("no identity");
    };
    add("b");
    EXPECT_EQ(request(), (Dictionary{{kSkylark, none}, {"b", own}}));
    EXPECT_EQ(raising.requests, 0);
    EXPECT_EQ(lines(),
              Strings{"Nimbus Plugins: Exception querying '(unknown)' for setup request: no identity"});
}

TEST_F(WLNimbusDelegatesRequestTest, APluginThatRaisesOnItsRequestIsNamedAndTheNextIsAsked) {
    add("a").request = []() -> std::optional<PropertyList> {
        throw std::runtime_error("no request");
    };
    add("b");
    EXPECT_EQ(request(), (Dictionary{{kSkylark, none}, {"b", own}}));
    EXPECT_EQ(lines(), Strings{"Nimbus Plugins: Exception querying 'a' for setup request: no request"});
}

TEST_F(WLNimbusDelegatesRequestTest, APluginMayThrowAnythingAtAll) {
    add("a").request = []() -> std::optional<PropertyList> {
        throw 42;
    };
    add("b");
    EXPECT_EQ(request(), (Dictionary{{kSkylark, none}, {"b", own}}));
    ASSERT_EQ(lines().size(), 1U);
    EXPECT_TRUE(lines()[0].starts_with("Nimbus Plugins: Exception querying 'a' for setup request: "));
}

TEST_F(WLNimbusDelegatesRequestTest, ARequestWithoutAnIdentifierCannotBeStored) {
    add(std::nullopt);
    add("b");
    EXPECT_EQ(request(), (Dictionary{{kSkylark, none}, {"b", own}}));
    EXPECT_EQ(lines(), Strings{"Nimbus Plugins: Exception querying '(unknown)' for setup request: "
                               "a request needs its delegate's identifier"});
}

TEST_F(WLNimbusDelegatesRequestTest, OmittingTheEmptyIdentifierOmitsNoPluginThatHasNone) {
    RequestingPlugin& nameless = add(std::nullopt);
    RequestingPlugin& empty = add("");
    EXPECT_EQ(request({}, {""}), (Dictionary{{kSkylark, none}}));
    EXPECT_EQ(nameless.requests, 1);
    EXPECT_EQ(empty.requests, 0);
    EXPECT_EQ(lines().size(), 1U);
}

TEST_F(WLNimbusDelegatesRequestTest, TheFormerOnlineServiceCanBeOmittedUnlessAnAdditionBringsIt) {
    EXPECT_EQ(request({}, {kSkylark}), none);
    EXPECT_EQ(request({{kSkylark, own}}, {kSkylark}), (Dictionary{{kSkylark, own}}));
}

TEST_F(WLNimbusDelegatesRequestTest, TheFormerOnlineServicesEmptyRequestReplacesAPluginsOfItsIdentifier) {
    RequestingPlugin& plugin = add(kSkylark);
    EXPECT_EQ(request(), (Dictionary{{kSkylark, none}}));
    EXPECT_EQ(plugin.requests, 1);
    EXPECT_EQ(request({}, {kSkylark}), none);
    EXPECT_EQ(plugin.requests, 1);
}

TEST_F(WLNimbusDelegatesRequestTest, APluginWithoutAnIdentifierThatRaisesOnItsRequestIsUnknown) {
    add(std::nullopt).request = []() -> std::optional<PropertyList> {
        throw std::runtime_error("no request");
    };
    EXPECT_EQ(request(), (Dictionary{{kSkylark, none}}));
    EXPECT_EQ(lines(),
              Strings{"Nimbus Plugins: Exception querying '(unknown)' for setup request: no request"});
}

TEST_F(WLNimbusDelegatesRequestTest, AdditionsWinOverPluginsAndTheFormerOnlineService) {
    add("com.corvid.vidlink");
    EXPECT_EQ(request({{"com.corvid.vidlink", "added"}, {kSkylark, "added"}, {"new", "added"}}),
              (Dictionary{{"com.corvid.vidlink", "added"}, {kSkylark, "added"}, {"new", "added"}}));
}

TEST_F(WLNimbusDelegatesRequestTest, AnAdditionIsSentForAnOmittedPluginToo) {
    add("com.corvid.vidlink");
    EXPECT_EQ(request({{"com.corvid.vidlink", "added"}}, {"com.corvid.vidlink"}),
              (Dictionary{{"com.corvid.vidlink", "added"}, {kSkylark, none}}));
}

TEST_F(WLNimbusDelegatesRequestTest, EverythingCanBeOmitted) {
    add("a");
    add("b");
    EXPECT_EQ(request({}, WLNimbusAllDelegateIdentifiers()), none);
    EXPECT_EQ(lines(), Strings{});
}

TEST_F(WLNimbusDelegatesRequestTest, PluginsThatRaiseAtEveryStepLeaveTheOthersUnharmed) {
    add("a").identify = []() -> Identifier {
        throw 1;
    };
    add("b").request = []() -> std::optional<PropertyList> {
        throw std::string("two");
    };
    add("c").request = [] {
        return std::optional<PropertyList>();
    };
    add(std::nullopt);
    add("d");
    EXPECT_EQ(request({{"b", "added"}}, {}), (Dictionary{{kSkylark, none}, {"b", "added"}, {"d", own}}));
    EXPECT_EQ(lines().size(), 4U);
}

TEST_F(WLNimbusDelegatesRequestTest, OfTwoPluginsThatNowShareAnIdentifierTheLaterRequestIsSent) {
    add("a");
    add("a").request = [] {
        return std::optional<PropertyList>("later");
    };
    EXPECT_EQ(request(), (Dictionary{{kSkylark, none}, {"a", "later"}}));
}

TEST_F(WLNimbusDelegatesRequestTest, ForMessagingAliasesOnlyTheTwoMessagingDelegatesAreAsked) {
    add("com.corvid.vidlink");
    RequestingPlugin& store = add("com.corvid.storefront");
    RequestingPlugin& nameless = add(std::nullopt);
    add("com.corvid.chatter");
    EXPECT_EQ(messagingRequest(),
              (Dictionary{{kSkylark, none}, {"com.corvid.vidlink", own}, {"com.corvid.chatter", own}}));
    EXPECT_EQ(store.requests, 0);
    EXPECT_EQ(nameless.requests, 0);
    EXPECT_EQ(lines(), Strings{});
}

TEST_F(WLNimbusDelegatesRequestTest, ForMessagingAliasesTheFormerOnlineServiceIsAlwaysThere) {
    EXPECT_EQ(messagingRequest(), (Dictionary{{kSkylark, none}}));
}

TEST_F(WLNimbusDelegatesRequestTest, ForMessagingAliasesADelegateThatOmitsItselfOrRaisesIsLogged) {
    add("com.corvid.vidlink").request = [] {
        return std::optional<PropertyList>();
    };
    add("com.corvid.chatter").request = []() -> std::optional<PropertyList> {
        throw std::runtime_error("no");
    };
    add("x").identify = []() -> Identifier {
        throw std::runtime_error("never");
    };
    EXPECT_EQ(messagingRequest(), (Dictionary{{kSkylark, none}}));
    EXPECT_EQ(lines(),
              (Strings{"Nimbus Plugins: Delegate com.corvid.vidlink omits itself from Nimbus setup",
                       "Nimbus Plugins: Exception querying 'com.corvid.chatter' for setup request: no",
                       "Nimbus Plugins: Exception querying '(unknown)' for setup request: never"}));
}

} // namespace
} // namespace welcomer
