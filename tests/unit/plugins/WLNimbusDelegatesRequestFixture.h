// What the tests of what is asked of the delegates share.

#pragma once

#include "plugins/WLNimbusDelegatesRequest.h"
#include "tests/fakes/FakePlatform.h"
#include "tests/fakes/PluginRegistry.h"

#include <functional>
#include <gtest/gtest.h>
#include <memory>
#include <string>
#include <vector>

namespace welcomer {

using Dictionary = PropertyList::Dictionary;
using Strings = std::vector<std::string>;
using Identifier = std::optional<std::string>;

// A plug-in whose answers a test chooses, and which keeps count of the questions.
class RequestingPlugin final : public WLFirstRunDelegateConfiguration {
  public:
    explicit RequestingPlugin(Identifier identifier) : identify([identifier] { return identifier; }) {}

    std::function<Identifier()> identify;
    std::function<std::optional<PropertyList>()> request = [] {
        return std::optional<PropertyList>(Dictionary{{"version", 1}});
    };
    std::function<std::optional<Strings>(const PropertyList&)> aliases = [](const PropertyList&) {
        return std::optional<Strings>(Strings{"alias"});
    };
    int requests = 0;
    int aliasQuestions = 0;

    Identifier delegateIdentifier() override { return identify(); }
    std::optional<PropertyList> delegateSetupRequest() override {
        ++requests;
        return request();
    }
    void completeSetupWithResponseHandler(const PropertyList&, CompletionHandler) override {}
    void completeSetupWithResponseChosenAliasesHandler(const PropertyList&, const std::optional<Strings>&,
                                                       CompletionHandler) override {}
    std::optional<Strings> messagingAliasesFromResponse(const PropertyList& response) override {
        ++aliasQuestions;
        return aliases(response);
    }
    std::string className() const override { return "RequestingPlugin"; }
};

class WLNimbusDelegatesRequestTest : public testing::Test {
  protected:
    RequestingPlugin& add(const Identifier& identifier) {
        auto plugin = std::make_shared<RequestingPlugin>(identifier);
        _plugins.push_back(plugin);
        fakes::fillPluginRegistry(_plugins);
        return *plugin;
    }

    // What the request has under "delegates"; the request must have nothing else.
    static Dictionary delegates(const Dictionary& request) {
        EXPECT_EQ(request.size(), 1U);
        const auto found = request.find("delegates");
        return found != request.end() && found->second.dictionary() ? *found->second.dictionary()
                                                                    : Dictionary{{"no delegates", true}};
    }

    Dictionary request(const Dictionary& additions = {}, const Strings& omissions = {}) {
        return delegates(WLNimbusDelegatesRequest(additions, omissions));
    }
    Dictionary messagingRequest() {
        return delegates(WLNimbusCreateOrLoginDelegatesRequestForMessagingAliases());
    }

    Strings lines() const { return fake.systemLog.lines(); }

    static constexpr const char* kSkylark = "com.corvid.skylark";
    const Dictionary own{{"version", 1}};
    const Dictionary none{};

    fakes::FakePlatform fake;
    const platform::ScopedPlatform installed{fake.platform()};

  private:
    DelegatePluginArray _plugins;
};

} // namespace welcomer
