// A delegate plug-in that does what a test says.

#pragma once

#include "plugins/WLFirstRunDelegateConfiguration.h"

#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

namespace welcomer {

using CompletionHandler = WLFirstRunDelegateConfiguration::CompletionHandler;
using Aliases = std::optional<std::vector<std::string>>;

// Completes at once unless a test says otherwise, and keeps what it was called with.
class TestDelegate final : public WLFirstRunDelegateConfiguration {
  public:
    explicit TestDelegate(std::string identifier) : identify([identifier] { return identifier; }) {}

    std::function<std::optional<std::string>()> identify;
    std::function<void(CompletionHandler)> complete = [](const CompletionHandler& handler) {
        handler(true, std::nullopt);
    };

    // One completion call: its response, and its aliases when it was the form that has them.
    struct Call {
        PropertyList response;
        std::optional<Aliases> aliases;
    };
    std::vector<Call> calls;

    std::optional<std::string> delegateIdentifier() override { return identify(); }
    std::optional<PropertyList> delegateSetupRequest() override { return std::nullopt; }

    void completeSetupWithResponseHandler(const PropertyList& response, CompletionHandler handler) override {
        calls.push_back({response, std::nullopt});
        complete(std::move(handler));
    }

    void completeSetupWithResponseChosenAliasesHandler(const PropertyList& response, const Aliases& aliases,
                                                       CompletionHandler handler) override {
        calls.push_back({response, aliases});
        complete(std::move(handler));
    }

    std::optional<std::vector<std::string>> messagingAliasesFromResponse(const PropertyList&) override {
        return std::nullopt;
    }

    std::string className() const override { return "TestDelegate"; }
};

} // namespace welcomer
