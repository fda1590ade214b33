// Handing a response over, the handler, the aliases and the termination.

#include "plugins/AbiDelegatePlugin.h"
#include "plugins/PropertyListHandles.h"
#include "tests/unit/plugins/AbiDelegatePluginFixture.h"
#include "tests/unit/plugins/InProcessPlugin.h"

#include <stdexcept>
#include <string>

namespace welcomer {
namespace {

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
