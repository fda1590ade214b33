// The messaging aliases of a response, and the delegates' identifiers.

#include "tests/unit/plugins/WLNimbusDelegatesRequestFixture.h"

#include <stdexcept>
#include <string>

namespace welcomer {
namespace {

class MessagingAliasesTest : public WLNimbusDelegatesRequestTest {
  protected:
    std::optional<Strings> aliases(const std::string& identifier, const PropertyList& response = "response") {
        return WLNimbusGetMessagingAliasesFromDelegateResponse(identifier, response);
    }
};

TEST_F(MessagingAliasesTest, AreThoseOfTheFirstPluginWithTheIdentifier) {
    RequestingPlugin& other = add("com.corvid.vidlink");
    add("com.corvid.chatter").aliases = [](const PropertyList& response) {
        return std::optional<Strings>(Strings{"a", *response.string()});
    };
    RequestingPlugin& later = add("com.corvid.chatter");
    EXPECT_EQ(aliases("com.corvid.chatter"), (Strings{"a", "response"}));
    EXPECT_EQ(other.aliasQuestions, 0);
    EXPECT_EQ(later.aliasQuestions, 0);
}

TEST_F(MessagingAliasesTest, AreNoneWithoutAPluginOfThatIdentifier) {
    add("com.corvid.vidlink");
    add(std::nullopt);
    EXPECT_EQ(aliases("com.corvid.chatter"), std::nullopt);
    EXPECT_EQ(lines(), Strings{});
}

TEST_F(MessagingAliasesTest, AreNoneWhenThePluginHasNone) {
    add("a").aliases = [](const PropertyList&) {
        return std::optional<Strings>();
    };
    RequestingPlugin& later = add("a");
    EXPECT_EQ(aliases("a"), std::nullopt);
    EXPECT_EQ(later.aliasQuestions, 0);
}

TEST_F(MessagingAliasesTest, APluginThatRaisesIsLoggedAndTheNextIsAsked) {
    add("x").identify = []() -> Identifier {
        throw std::runtime_error("no identity");
    };
    add("a").aliases = [](const PropertyList&) -> std::optional<Strings> {
        throw std::runtime_error("no aliases");
    };
    add("a");
    EXPECT_EQ(aliases("a"), Strings{"alias"});
    EXPECT_EQ(lines(), (Strings{"Nimbus Plugins: Exception querying 'a' for aliases: no identity",
                                "Nimbus Plugins: Exception querying 'a' for aliases: no aliases"}));
}

TEST_F(MessagingAliasesTest, AnEmptyIdentifierIsUnknownInTheLog) {
    add("").aliases = [](const PropertyList&) -> std::optional<Strings> {
        throw std::runtime_error("no");
    };
    EXPECT_EQ(aliases(""), std::nullopt);
    EXPECT_EQ(lines(), Strings{"Nimbus Plugins: Exception querying '(unknown)' for aliases: no"});
}

using DelegateIdentifiersTest = WLNimbusDelegatesRequestTest;

TEST_F(DelegateIdentifiersTest, AllBeginWithTheFormerOnlineServiceAndKeepTheRegistrysOrder) {
    add("z");
    add("a");
    EXPECT_EQ(WLNimbusAllDelegateIdentifiers(), (Strings{kSkylark, "z", "a"}));
}

TEST_F(DelegateIdentifiersTest, EmptyOnesAndThoseThatRaiseAreLeftOutSilently) {
    add("");
    add(std::nullopt);
    add("x").identify = []() -> Identifier {
        throw 42;
    };
    add("a");
    EXPECT_EQ(WLNimbusAllDelegateIdentifiers(), (Strings{kSkylark, "a"}));
    EXPECT_EQ(lines(), Strings{});
}

TEST_F(DelegateIdentifiersTest, TheStoresAreTheAppStoreAndTheEBookStore) {
    EXPECT_EQ(WLNimbusStoreDelegateIdentifiers(), (Strings{"com.corvid.storefront", "com.corvid.reader"}));
}

} // namespace
} // namespace welcomer
