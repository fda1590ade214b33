#include "plugins/AbiDelegatePlugin.h"

#include "plugins/PluginMark.h"
#include "plugins/PropertyListHandles.h"
#include "tests/unit/plugins/InProcessPlugin.h"

#include <cstring>
#include <functional>
#include <gtest/gtest.h>
#include <stdexcept>
#include <string>
#include <vector>

namespace welcomer {
namespace {

using fakes::InProcessPlugin;
using Aliases = std::optional<std::vector<std::string>>;

constexpr const char* kName = "Sample.ncdplugin";

class AbiDelegatePluginTest : public testing::Test {
  protected:
    std::shared_ptr<AbiDelegatePlugin> create() {
        return AbiDelegatePlugin::create(*plugin.exportAs<0>(), kName);
    }

    const wl_delegate_plugin_descriptor* principalClass() {
        return AbiDelegatePlugin::principalClass(plugin.exportAs<0>(), reason);
    }

    // What a call throws; a failure when that is of another kind than callers may expect, or nothing.
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

    WLFirstRunDelegateConfiguration::CompletionHandler handler() {
        return [this](bool succeeded, const std::optional<platform::Error>& error) {
            ++handlerCalls;
            lastSucceeded = succeeded;
            lastError = error;
        };
    }

    InProcessPlugin plugin{"com.corvid.sample"};
    const wl_host& host = delegatePluginHost();
    std::string reason;
    int handlerCalls = 0;
    bool lastSucceeded = false;
    std::optional<platform::Error> lastError;
};

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
    plugin.instance.size -= 1;
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

TEST_F(AbiDelegatePluginTest, HandsOverAResponseOfAnyTypeAsItStands) {
    const PropertyList responses[] = {PropertyList::Dictionary{{"k", PropertyList::Array{1, "a"}}},
                                      PropertyList::Array{true},
                                      "text",
                                      7,
                                      1.5,
                                      false,
                                      PropertyList::Data{"bytes"},
                                      PropertyList::Date{3}};
    for (const PropertyList& response : responses) {
        std::optional<PropertyList> received;
        plugin.complete = [&](const wl_value* value, const wl_value*, wl_completion_handler, wl_error_slot*) {
            received = takeHandle(host.copy(value));
        };
        create()->completeSetupWithResponseHandler(response, handler());
        EXPECT_EQ(received, response);
    }
}

TEST_F(AbiDelegatePluginTest, HandsOverTheAliases) {
    std::optional<PropertyList> received;
    plugin.complete = [&](const wl_value*, const wl_value* aliases, wl_completion_handler, wl_error_slot*) {
        received = takeHandle(host.copy(aliases));
    };
    create()->completeSetupWithResponseChosenAliasesHandler({}, Aliases({"a", "b"}), handler());
    EXPECT_EQ(received, PropertyList(PropertyList::Array{"a", "b"}));
    create()->completeSetupWithResponseChosenAliasesHandler({}, Aliases(std::in_place), handler());
    EXPECT_EQ(received, PropertyList(PropertyList::Array{}));
    create()->completeSetupWithResponseChosenAliasesHandler({}, std::nullopt, handler());
    EXPECT_EQ(received, std::nullopt);
}

TEST_F(AbiDelegatePluginTest, PassesTheHandlerOn) {
    plugin.complete = [](const wl_value*, const wl_value*, wl_completion_handler issued, wl_error_slot*) {
        issued.call(issued.context, false, 5, "went wrong");
    };
    const auto instance = create();
    instance->completeSetupWithResponseHandler({}, handler());
    EXPECT_EQ(handlerCalls, 1);
    EXPECT_FALSE(lastSucceeded);
    EXPECT_EQ(lastError, (platform::Error{5, "went wrong"}));
    instance->completeSetupWithResponseChosenAliasesHandler({}, std::nullopt, handler());
    EXPECT_EQ(handlerCalls, 2);
}

TEST_F(AbiDelegatePluginTest, AHandlerMayBeCalledAfterTheInstanceIsGone) {
    wl_completion_handler kept = {};
    plugin.complete = [&](const wl_value*, const wl_value*, wl_completion_handler issued, wl_error_slot*) {
        kept = issued;
    };
    create()->completeSetupWithResponseHandler({}, handler());
    EXPECT_EQ(handlerCalls, 0);
    kept.call(kept.context, true, 0, nullptr);
    EXPECT_EQ(handlerCalls, 1);
    kept.call(kept.context, true, 0, nullptr);
    EXPECT_EQ(handlerCalls, 1);
}

TEST_F(AbiDelegatePluginTest, AHandlerThatIsCalledAfterARaiseDoesNothing) {
    wl_completion_handler kept = {};
    plugin.complete = [&](const wl_value*, const wl_value*, wl_completion_handler issued,
                          wl_error_slot* slot) {
        kept = issued;
        host.raise(slot, "gave up");
    };
    const auto instance = create();
    EXPECT_EQ(thrown([&] { instance->completeSetupWithResponseHandler({}, handler()); }), "gave up");
    kept.call(kept.context, true, 0, nullptr);
    EXPECT_EQ(
        thrown([&] { instance->completeSetupWithResponseChosenAliasesHandler({}, std::nullopt, handler()); }),
        "gave up");
    kept.call(kept.context, true, 0, nullptr);
    EXPECT_EQ(handlerCalls, 0);
}

TEST_F(AbiDelegatePluginTest, TextsOfThePluginAreOneLineOfBoundedLength) {
    const std::string text = "broken\n<115>forged\x1b[2J" + std::string(100000, 'x');
    const std::string shown = ("broken\\n<115>forged\\x1b[2J" + std::string(1024, 'x')).substr(0, 1021) + "…";
    plugin.complete = [&](const wl_value*, const wl_value*, wl_completion_handler, wl_error_slot* slot) {
        host.raise(slot, text.c_str());
    };
    EXPECT_EQ(thrown([&] { create()->completeSetupWithResponseHandler({}, handler()); }), shown);
    plugin.complete = [&](const wl_value*, const wl_value*, wl_completion_handler, wl_error_slot*) {
        throw std::runtime_error(text);
    };
    EXPECT_EQ(thrown([&] { create()->completeSetupWithResponseHandler({}, handler()); }), shown);
    plugin.complete = [&](const wl_value*, const wl_value*, wl_completion_handler issued, wl_error_slot*) {
        issued.call(issued.context, false, 5, text.c_str());
    };
    std::optional<platform::Error> received;
    create()->completeSetupWithResponseHandler(
        {}, [&](bool, const std::optional<platform::Error>& given) { received = given; });
    EXPECT_EQ(received, (platform::Error{5, shown}));
}

TEST_F(AbiDelegatePluginTest, AHandlerThatIsCalledBeforeARaiseHasCounted) {
    plugin.complete = [&](const wl_value*, const wl_value*, wl_completion_handler issued,
                          wl_error_slot* slot) {
        issued.call(issued.context, true, 0, nullptr);
        host.raise(slot, "too late");
    };
    EXPECT_EQ(thrown([&] { create()->completeSetupWithResponseHandler({}, handler()); }), "too late");
    EXPECT_EQ(handlerCalls, 1);
}

TEST_F(AbiDelegatePluginTest, TakesAliases) {
    plugin.aliases = [this](const wl_value*, wl_error_slot*) {
        wl_value* aliases = host.new_array();
        host.array_append(aliases, host.new_string("a@example.com", WL_NUL_TERMINATED));
        return aliases;
    };
    EXPECT_EQ(create()->messagingAliasesFromResponse({}), Aliases({"a@example.com"}));
}

TEST_F(AbiDelegatePluginTest, TakesNoAliasesForNone) {
    plugin.aliases = [](const wl_value*, wl_error_slot*) -> wl_value* {
        return nullptr;
    };
    EXPECT_EQ(create()->messagingAliasesFromResponse({}), std::nullopt);
}

TEST_F(AbiDelegatePluginTest, RaisesForAliasesThatAreNoArray) {
    plugin.aliases = [this](const wl_value*, wl_error_slot*) {
        return host.new_integer(1);
    };
    EXPECT_EQ(thrown([&] { create()->messagingAliasesFromResponse({}); }),
              "messagingAliasesFromResponse: returned no array");
}

TEST_F(AbiDelegatePluginTest, RaisesForAnAliasThatIsNoString) {
    plugin.aliases = [this](const wl_value*, wl_error_slot*) {
        wl_value* aliases = host.new_array();
        host.array_append(aliases, host.new_string("a", 1));
        host.array_append(aliases, host.new_integer(1));
        return aliases;
    };
    EXPECT_EQ(thrown([&] { create()->messagingAliasesFromResponse({}); }),
              "messagingAliasesFromResponse: returned an alias that is no string");
}

TEST_F(AbiDelegatePluginTest, RaisesForOperationsThatAreMissing) {
    const auto instance = create();
    plugin.instance.delegate_identifier = nullptr;
    plugin.instance.delegate_setup_request = nullptr;
    plugin.instance.complete_setup_with_response = nullptr;
    plugin.instance.complete_setup_with_response_chosen_aliases = nullptr;
    plugin.instance.messaging_aliases_from_response = nullptr;
    EXPECT_EQ(thrown([&] { instance->delegateIdentifier(); }), "delegateIdentifier is not implemented");
    EXPECT_EQ(thrown([&] { instance->delegateSetupRequest(); }), "delegateSetupRequest is not implemented");
    EXPECT_EQ(thrown([&] { instance->completeSetupWithResponseHandler({}, handler()); }),
              "completeSetupWithResponse:handler: is not implemented");
    EXPECT_EQ(
        thrown([&] { instance->completeSetupWithResponseChosenAliasesHandler({}, std::nullopt, handler()); }),
        "completeSetupWithResponse:chosenAliases:handler: is not implemented");
    EXPECT_EQ(thrown([&] { instance->messagingAliasesFromResponse({}); }),
              "messagingAliasesFromResponse: is not implemented");
    EXPECT_EQ(handlerCalls, 0);
}

TEST_F(AbiDelegatePluginTest, DoesNothingForATerminationThatIsMissing) {
    ASSERT_EQ(plugin.instance.terminate_setup_completion, nullptr);
    EXPECT_NO_THROW(create()->terminateSetupCompletion());
}

TEST_F(AbiDelegatePluginTest, PassesTheTerminationOn) {
    static int calls = 0;
    plugin.instance.terminate_setup_completion = [](wl_delegate*, wl_error_slot*) {
        ++calls;
    };
    create()->terminateSetupCompletion();
    EXPECT_EQ(calls, 1);
    plugin.instance.terminate_setup_completion = [](wl_delegate* self, wl_error_slot* slot) {
        InProcessPlugin::of(self).host->raise(slot, "cannot stop");
    };
    EXPECT_EQ(thrown([&] { create()->terminateSetupCompletion(); }), "cannot stop");
}

} // namespace
} // namespace welcomer
