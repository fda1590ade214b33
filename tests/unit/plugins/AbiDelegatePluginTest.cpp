// Making an instance, and what it is asked before it completes.

#include "plugins/AbiDelegatePlugin.h"
#include "plugins/PluginMark.h"
#include "plugins/PropertyListHandles.h"
#include "tests/fakes/FakePlatform.h"
#include "tests/unit/plugins/AbiDelegatePluginFixture.h"
#include "tests/unit/plugins/InProcessPlugin.h"

#include <cstddef>
#include <stdexcept>
#include <string>
#include <vector>

namespace welcomer {
namespace {

TEST_F(AbiDelegatePluginTest, TakesAPrincipalClassOfThisVersion) {
    EXPECT_EQ(principalClass(), &plugin.descriptor);
    EXPECT_EQ(reason, "");
}

TEST_F(AbiDelegatePluginTest, FindsNoPrincipalClassWithoutASymbol) {
    EXPECT_EQ(AbiDelegatePlugin::principalClass(nullptr, reason), nullptr);
    EXPECT_EQ(reason, "no symbol wl_delegate_plugin");
}

TEST_F(AbiDelegatePluginTest, ReadsNothingBehindAnotherVersion) {
    const auto version = std::make_unique<std::uint32_t>(2); // a sanitizer build sees a read beyond it
    EXPECT_EQ(AbiDelegatePlugin::principalClass(version.get(), reason), nullptr);
    EXPECT_EQ(reason, "ABI version 2 instead of 1");
}

TEST_F(AbiDelegatePluginTest, FindsNoPrincipalClassInAStructureThatIsTooSmall) {
    plugin.descriptor.size -= 1;
    EXPECT_EQ(principalClass(), nullptr);
    EXPECT_NE(reason, "");
}

TEST_F(AbiDelegatePluginTest, TakesAPrincipalClassThatHasMoreMembers) {
    plugin.descriptor.size += 8;
    EXPECT_NE(principalClass(), nullptr);
}

TEST_F(AbiDelegatePluginTest, ConformsByTheExactNameOfTheProtocol) {
    EXPECT_TRUE(AbiDelegatePlugin::conformsToProtocol(plugin.descriptor));
    for (const char* name : {"", "WLFirstRunDelegateConfiguratio", "wlfirstrundelegateconfiguration",
                             static_cast<const char*>(nullptr)}) {
        plugin.descriptor.protocol = name;
        EXPECT_FALSE(AbiDelegatePlugin::conformsToProtocol(plugin.descriptor));
    }
}

TEST_F(AbiDelegatePluginTest, GivesThePluginTheHost) {
    create();
    EXPECT_EQ(plugin.host, &delegatePluginHost());
}

TEST_F(AbiDelegatePluginTest, DestroysTheInstanceOnce) {
    create().reset();
    EXPECT_EQ(plugin.created, 1);
    EXPECT_EQ(plugin.destroyed, 1);
}

TEST_F(AbiDelegatePluginTest, DoesWithoutDestroy) {
    plugin.descriptor.destroy = nullptr;
    create().reset();
    EXPECT_EQ(plugin.destroyed, 0);
}

TEST_F(AbiDelegatePluginTest, SurvivesADestroyThatThrows) {
    plugin.descriptor.destroy = [](wl_delegate*) {
        throw std::runtime_error("in destroy");
    };
    auto instance = create();
    EXPECT_NO_THROW(instance.reset());
}

TEST_F(AbiDelegatePluginTest, MakesNothingWithoutCreate) {
    plugin.exportAs<0>();
    plugin.descriptor.create = nullptr;
    EXPECT_EQ(AbiDelegatePlugin::create(plugin.descriptor, kName), nullptr);
}

TEST_F(AbiDelegatePluginTest, MakesNothingOfAnInstanceThatIsTooSmallAndGivesItBack) {
    plugin.instance.size = offsetof(wl_delegate, get_extension) - 1; // where the first version ended
    EXPECT_EQ(create(), nullptr);
    EXPECT_EQ(plugin.destroyed, 1);
}

TEST_F(AbiDelegatePluginTest, TheThreadIsMarkedWithItsNameWhileItIsInThePlugin) {
    std::vector<std::string> marks;
    const auto note = [&marks] {
        marks.emplace_back(PluginMark::current() ? PluginMark::current() : "none");
    };
    plugin.create = [&](wl_error_slot*) {
        note();
        return &plugin.instance;
    };
    plugin.request = [&](wl_error_slot*) -> wl_value* {
        note();
        throw std::runtime_error("leaves the mark behind?");
    };
    plugin.complete = [&](auto...) {
        note();
    };
    plugin.aliases = [&](auto...) {
        note();
        return static_cast<wl_value*>(nullptr);
    };
    const auto instance = create();
    note();
    thrown([&] { instance->delegateSetupRequest(); });
    note();
    instance->completeSetupWithResponseHandler({}, handler());
    instance->completeSetupWithResponseChosenAliasesHandler({}, std::nullopt, handler());
    instance->messagingAliasesFromResponse({});
    note();
    EXPECT_EQ(marks, (std::vector<std::string>{kName, "none", kName, "none", kName, kName, kName, "none"}));
}

TEST_F(AbiDelegatePluginTest, PassesOnAnExceptionOfCreate) {
    plugin.create = [](wl_error_slot*) -> wl_delegate* {
        throw std::runtime_error("in create");
    };
    EXPECT_EQ(thrown([&] { create(); }), "in create");
    EXPECT_EQ(plugin.destroyed, 0);
}

TEST_F(AbiDelegatePluginTest, CopiesTheIdentifier) {
    const auto instance = create();
    const auto identifier = instance->delegateIdentifier();
    plugin.identifier = "another text of a certain length";
    EXPECT_EQ(identifier, "com.corvid.sample");
}

TEST_F(AbiDelegatePluginTest, TheIdentifierOnLoadCountsAndAChangeIsSaidOnce) {
    fakes::FakePlatform fake;
    const platform::ScopedPlatform installed(fake.platform());
    const auto instance = create();
    EXPECT_EQ(instance->delegateIdentifier(), "com.corvid.sample");
    EXPECT_EQ(instance->delegateIdentifier(), "com.corvid.sample");
    EXPECT_EQ(fake.systemLog.lines(), std::vector<std::string>{});
    plugin.identifier = "com.corvid.other\n";
    EXPECT_EQ(instance->delegateIdentifier(), "com.corvid.sample");
    plugin.identifier.reset();
    EXPECT_EQ(instance->delegateIdentifier(), "com.corvid.sample");
    EXPECT_EQ(fake.systemLog.lines(),
              std::vector<std::string>{"Nimbus Plugins: 'Sample.ncdplugin' has changed its identifier to "
                                       "'com.corvid.other\\n', the one on load counts: 'com.corvid.sample'"});
}

TEST_F(AbiDelegatePluginTest, OneThatHadNoIdentifierGetsNoneLater) {
    fakes::FakePlatform fake;
    const platform::ScopedPlatform installed(fake.platform());
    plugin.identifier.reset();
    const auto instance = create();
    EXPECT_EQ(instance->delegateIdentifier(), std::nullopt);
    plugin.identifier = "com.corvid.late";
    EXPECT_EQ(instance->delegateIdentifier(), std::nullopt);
}

TEST_F(AbiDelegatePluginTest, GivesTheClassNameInMessages) {
    EXPECT_EQ(describe(*create()), "<Sample>");
    plugin.descriptor.class_name = nullptr;
    EXPECT_EQ(create()->className(), "(unnamed)");
    plugin.descriptor.class_name = "a\xFF";
    EXPECT_EQ(create()->className(), "a\xEF\xBF\xBD");
}

TEST_F(AbiDelegatePluginTest, TakesARequest) {
    plugin.request = [this](wl_error_slot*) {
        wl_value* request = host.new_dictionary();
        host.dictionary_set(request, "k", 1, host.new_integer(1));
        return request;
    };
    EXPECT_EQ(create()->delegateSetupRequest(), PropertyList(PropertyList::Dictionary{{"k", 1}}));
}

TEST_F(AbiDelegatePluginTest, TakesNoRequestForNone) {
    EXPECT_EQ(create()->delegateSetupRequest(), std::nullopt);
}

TEST_F(AbiDelegatePluginTest, TakesAnEmptyRequestAsItIs) {
    plugin.request = [this](wl_error_slot*) {
        return host.new_dictionary();
    };
    EXPECT_EQ(create()->delegateSetupRequest(), PropertyList(PropertyList::Dictionary{}));
}

TEST_F(AbiDelegatePluginTest, RaisesForARequestThatIsNoDictionary) {
    plugin.request = [this](wl_error_slot*) {
        return host.new_array();
    };
    EXPECT_EQ(thrown([&] { create()->delegateSetupRequest(); }),
              "delegateSetupRequest returned no dictionary");
}

// A value that a plug-in can only have from a response.
const PropertyList kUnwritable = PropertyList::Array{"good", "a\x01"};

TEST_F(AbiDelegatePluginTest, RaisesForARequestThatCannotBeWritten) {
    plugin.request = [this](wl_error_slot*) {
        wl_value* request = host.new_dictionary();
        host.dictionary_set(request, "names", 5, host.copy(borrowedHandle(kUnwritable)));
        return request;
    };
    EXPECT_EQ(
        thrown([&] { create()->delegateSetupRequest(); }),
        "delegateSetupRequest returned what cannot be written: names/1 holds U+0001, for which XML has no "
        "place");
}

TEST_F(AbiDelegatePluginTest, RaisesForAliasesThatCannotBeWritten) {
    plugin.aliases = [this](const wl_value* response, wl_error_slot*) {
        return host.copy(response);
    };
    EXPECT_EQ(
        thrown([&] { create()->messagingAliasesFromResponse(kUnwritable); }),
        "messagingAliasesFromResponse: returned what cannot be written: 1 holds U+0001, for which XML has no "
        "place");
}

TEST_F(AbiDelegatePluginTest, RaisesForAnIdentifierThatCannotBeWritten) {
    plugin.identifier = "com.corvid.\x01";
    EXPECT_EQ(
        thrown([&] { create()->delegateIdentifier(); }),
        "delegateIdentifier returned what cannot be written: the value holds U+0001, for which XML has no "
        "place");
}

TEST_F(AbiDelegatePluginTest, AResponseThatCannotBeWrittenIsHandedOverAsItStands) {
    std::optional<PropertyList> received;
    plugin.complete = [&](const wl_value* response, const wl_value*, wl_completion_handler, wl_error_slot*) {
        received = takeHandle(host.copy(response));
    };
    create()->completeSetupWithResponseHandler(kUnwritable, handler());
    EXPECT_EQ(received, kUnwritable);
}

TEST_F(AbiDelegatePluginTest, RaisesAndReleasesTheRequestThatCameAllTheSame) {
    plugin.request = [this](wl_error_slot* slot) {
        host.raise(slot, "rather not");
        return host.new_dictionary(); // the leak check of a sanitizer build looks here
    };
    EXPECT_EQ(thrown([&] { create()->delegateSetupRequest(); }), "rather not");
}

} // namespace
} // namespace welcomer
