// What each delegate is given, and what is logged.

#include "tests/unit/agent/RemainingDelegateSetupFixture.h"
#include "tests/unit/agent/TestDelegate.h"

#include <stdexcept>
#include <string>

namespace welcomer {
namespace {

TEST_F(RemainingDelegateSetupTest, AliasesAreCountedBeforeThePluginsAreAskedFor) {
    const std::string folder = "/System/Library/CoreServices/FirstRunPlugins";
    fake.fileSystem.addFile(folder + "/broken.ncdplugin", "");
    fake.pluginBundle.addBroken(folder + "/broken.ncdplugin", "no library");
    int asked = 0;
    fake.pluginBundle.onLoad = [&] {
        ++asked;
        EXPECT_EQ(fake.systemLog.lines(), (Lines{"Vidlink: 2 aliases", "Chatter: 1 aliases"}));
        EXPECT_EQ(fake.virtualTime.queueNames(), Lines{});
    };
    setUp(PropertyList::Dictionary{{"vlAliases", PropertyList::Array{"a", "b"}},
                                   {"imAliases", PropertyList::Array{"c"}}});
    EXPECT_EQ(asked, 1);
    EXPECT_EQ(fake.systemLog.lines(),
              (Lines{"Vidlink: 2 aliases", "Chatter: 1 aliases",
                     "Nimbus Plugins: Failed to get principal class for broken.ncdplugin"}));
}

TEST_F(RemainingDelegateSetupTest, AbsentAliasesCountAsZeroAndArePassedOnAsNone) {
    TestDelegate& vidlink = add("com.corvid.vidlink");
    TestDelegate& chatter = add("com.corvid.chatter");
    respond("com.corvid.vidlink");
    respond("com.corvid.chatter");
    setUpAndFinish();
    EXPECT_EQ(fake.systemLog.lines()[0], "Vidlink: 0 aliases");
    EXPECT_EQ(fake.systemLog.lines()[1], "Chatter: 0 aliases");
    for (const TestDelegate* plugin : {&vidlink, &chatter}) {
        ASSERT_EQ(plugin->calls.size(), 1U);
        ASSERT_TRUE(plugin->calls[0].aliases) << "called without the aliases";
        EXPECT_EQ(*plugin->calls[0].aliases, std::nullopt);
    }
}

TEST_F(RemainingDelegateSetupTest, EachMessagingDelegateGetsItsOwnAliasesAndResponse) {
    others = {{"vlAliases", PropertyList::Array{"a", "b"}}, {"imAliases", PropertyList::Array{}}};
    TestDelegate& vidlink = add("com.corvid.vidlink");
    TestDelegate& chatter = add("com.corvid.chatter");
    respond("com.corvid.vidlink", 1);
    respond("com.corvid.chatter", 2);
    setUpAndFinish();
    ASSERT_EQ(vidlink.calls.size(), 1U);
    EXPECT_EQ(vidlink.calls[0].response, PropertyList(1));
    EXPECT_EQ(vidlink.calls[0].aliases.value(), Aliases(Lines{"a", "b"}));
    ASSERT_EQ(chatter.calls.size(), 1U);
    EXPECT_EQ(chatter.calls[0].response, PropertyList(2));
    EXPECT_EQ(chatter.calls[0].aliases.value(), Aliases(Lines{}));
}

TEST_F(RemainingDelegateSetupTest, OtherDelegatesGetTheResponseAlone) {
    others = {{"vlAliases", PropertyList::Array{"a"}}};
    TestDelegate& storefront = add("com.corvid.storefront");
    respond("com.corvid.storefront", PropertyList::Dictionary{{"k", "v"}});
    setUpAndFinish();
    ASSERT_EQ(storefront.calls.size(), 1U);
    EXPECT_EQ(storefront.calls[0].response, PropertyList(PropertyList::Dictionary{{"k", "v"}}));
    EXPECT_FALSE(storefront.calls[0].aliases);
}

TEST_F(RemainingDelegateSetupTest, WithoutResponsesEveryPluginIsLoggedAndNothingIsQueued) {
    add("b");
    add("a");
    setUp(PropertyList());
    EXPECT_EQ(fake.systemLog.lines(), (Lines{"Vidlink: 0 aliases", "Chatter: 0 aliases",
                                             "no cached response for b", "no cached response for a"}));
    EXPECT_TRUE(group->wait(0ns));
    EXPECT_EQ(fake.virtualTime.queueNames(), Lines{kSharedQueue});
}

TEST_F(RemainingDelegateSetupTest, AnIdentifierIsOneLineOfTheLogWhateverIsInIt) {
    add("a\nforged");
    add("b\nforged");
    respond("b\nforged");
    setUpAndFinish();
    const Lines lines = fake.systemLog.lines();
    ASSERT_GE(lines.size(), 4U);
    EXPECT_EQ(lines[2], R"(no cached response for a\nforged)");
    EXPECT_EQ(lines[3], R"(setting up b\nforged)");
}

TEST_F(RemainingDelegateSetupTest, ResponsesWithoutAPluginAreIgnoredSilently) {
    respond("com.corvid.gone");
    setUpAndFinish();
    EXPECT_EQ(fake.systemLog.lines(), (Lines{"Vidlink: 0 aliases", "Chatter: 0 aliases"}));
}

TEST_F(RemainingDelegateSetupTest, EntriesOfTheWrongTypeCountAsAbsent) {
    add("a");
    const Lines asIfAbsent{"Vidlink: 0 aliases", "Chatter: 0 aliases", "no cached response for a"};
    for (const PropertyList& wrong : {PropertyList("text"), PropertyList(7), PropertyList(true),
                                      PropertyList(PropertyList::Array{"a"})}) {
        others = {{"delegatesResponseDict", wrong},
                  {"vlAliases", "alias"},
                  {"imAliases", PropertyList::Dictionary{{"alias", "a"}}}};
        fake.systemLog.clear();
        setUpAndFinish();
        EXPECT_EQ(fake.systemLog.lines(), asIfAbsent);

        others = {{"delegatesResponseDict", PropertyList::Dictionary{{"delegates", wrong}}}};
        fake.systemLog.clear();
        setUpAndFinish();
        EXPECT_EQ(fake.systemLog.lines(), asIfAbsent);
    }
}

TEST_F(RemainingDelegateSetupTest, AReplayObjectThatIsNoDictionaryHasNoEntries) {
    add("a");
    for (const PropertyList& object : {PropertyList("text"), PropertyList(PropertyList::Array{"a"})}) {
        fake.systemLog.clear();
        setUp(object);
        EXPECT_EQ(fake.systemLog.lines(),
                  (Lines{"Vidlink: 0 aliases", "Chatter: 0 aliases", "no cached response for a"}));
    }
}

TEST_F(RemainingDelegateSetupTest, AliasesThatAreNoStringsCountAsAbsent) {
    others = {{"vlAliases", PropertyList::Array{"a", 1, true, PropertyList::Array{"x"}, "b"}}};
    TestDelegate& vidlink = add("com.corvid.vidlink");
    respond("com.corvid.vidlink");
    setUpAndFinish();
    EXPECT_EQ(fake.systemLog.lines()[0], "Vidlink: 2 aliases");
    ASSERT_EQ(vidlink.calls.size(), 1U);
    EXPECT_EQ(vidlink.calls[0].aliases.value(), Aliases(Lines{"a", "b"}));
}

TEST_F(RemainingDelegateSetupTest, AResponseThatIsNoDictionaryIsHandedOverAsItStands) {
    TestDelegate& plugin = add("a");
    for (const PropertyList& response : {PropertyList("text"), PropertyList(7), PropertyList(false),
                                         PropertyList(PropertyList::Data{"\x01"})}) {
        respond("a", response);
        setUpAndFinish();
        ASSERT_FALSE(plugin.calls.empty());
        EXPECT_EQ(plugin.calls.back().response, response);
    }
}

TEST_F(RemainingDelegateSetupTest, APluginThatRaisesOnItsIdentifierIsLoggedAndSkipped) {
    add("x").identify = []() -> std::optional<std::string> {
        throw std::runtime_error("who am I");
    };
    add("y").identify = []() -> std::optional<std::string> {
        throw 42;
    };
    TestDelegate& other = add("z");
    respond("z");
    setUpAndFinish();
    const Lines lines = fake.systemLog.lines();
    ASSERT_EQ(lines.size(), 6U);
    EXPECT_EQ(lines[2], "exception querying plugin <TestDelegate> for id: who am I");
    EXPECT_EQ(lines[3].substr(0, 49), "exception querying plugin <TestDelegate> for id: ");
    EXPECT_EQ(lines[4], "setting up z");
    EXPECT_EQ(other.calls.size(), 1U);
}

TEST_F(RemainingDelegateSetupTest, APluginWithoutAnIdentifierHasNoResponse) {
    TestDelegate& plugin = add("x");
    plugin.identify = [] {
        return std::nullopt;
    };
    respond("x");
    respond("");
    setUpAndFinish();
    EXPECT_EQ(fake.systemLog.lines().back(), "no cached response for (null)");
    EXPECT_EQ(plugin.calls.size(), 0U);
}

TEST_F(RemainingDelegateSetupTest, TheWholeLogInItsOrder) {
    add("com.corvid.vidlink").complete = [this](const CompletionHandler& handler) {
        fake.virtualTime.global().asyncAfter(1250ms, [handler] { handler(true, std::nullopt); });
    };
    add("com.corvid.storefront").complete = [this](const CompletionHandler& handler) {
        fake.virtualTime.global().asyncAfter(500ms, [handler] {
            handler(false, platform::Error{3, "sold out"});
        });
    };
    add("com.corvid.silent");
    add("com.corvid.chatter").complete = [](const CompletionHandler&) {
        throw std::runtime_error("hung up");
    };
    respond("com.corvid.vidlink");
    respond("com.corvid.storefront");
    respond("com.corvid.chatter");
    setUpAndFinish();
    EXPECT_EQ(fake.systemLog.lines(),
              (Lines{"Vidlink: 0 aliases", "Chatter: 0 aliases", "no cached response for com.corvid.silent",
                     "setting up com.corvid.chatter", "setting up com.corvid.storefront",
                     "setting up com.corvid.vidlink",
                     "exception in setup response for plugin com.corvid.chatter (0.000 seconds): hung up",
                     "com.corvid.storefront setup: sold out (0.500 seconds)",
                     "com.corvid.vidlink setup+chosen: completed (1.250 seconds)"}));
    for (const auto& record : fake.systemLog.records()) {
        EXPECT_EQ(record.priority, 115);
    }
}

} // namespace
} // namespace welcomer
