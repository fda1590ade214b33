// The video-calling delegate: it takes up the addresses that the user chose, on a thread of its own.

#include <welcomer/DelegatePlugin.hpp>

#include <chrono>
#include <exception>
#include <string>
#include <thread>
#include <utility>

namespace sdk = welcomer::sdk;

namespace {

// How long the server asks the delegate to take; enough to be seen when it says nothing.
std::chrono::duration<double> delay(sdk::ValueView response) {
    const sdk::ValueView seconds = response.find("delaySeconds");
    const double whole = static_cast<double>(seconds.integer().value_or(0));
    const double wanted = seconds.type() == WL_VALUE_NONE ? 0.02 : seconds.real().value_or(whole);
    return std::chrono::duration<double>(wanted > 0 && wanted < 3600 ? wanted : 0);
}

std::vector<std::string> offeredAliases(sdk::ValueView response) {
    std::vector<std::string> aliases;
    const sdk::ValueView offered = response.find("aliases");
    for (std::size_t index = 0; index < offered.size(); ++index) {
        if (auto alias = offered.at(index).string()) {
            aliases.push_back(std::move(*alias));
        }
    }
    return aliases;
}

class Vidlink : public sdk::WLFirstRunDelegateConfiguration {
  public:
    std::optional<std::string> delegateIdentifier() override { return "com.corvid.vidlink"; }

    std::optional<sdk::Value> delegateSetupRequest() override {
        sdk::Value request = sdk::Value::dictionary();
        request.set("protocolVersion", 2).set("wantsAliases", true);
        return request;
    }

    void completeSetupWithResponseHandler(sdk::ValueView response, sdk::CompletionHandler handler) override {
        completeSetupWithResponseChosenAliasesHandler(response, std::nullopt, handler);
    }

    void completeSetupWithResponseChosenAliasesHandler(sdk::ValueView response,
                                                       const std::optional<std::vector<std::string>>& aliases,
                                                       sdk::CompletionHandler handler) override {
        if (response.type() != WL_VALUE_DICTIONARY) {
            handler(false, sdk::Error{0, "the response is no dictionary"});
            return;
        }
        // The response is gone once this returns, so what the thread needs goes along.
        const auto offered = offeredAliases(response);
        for (const std::string& alias : aliases.value_or(std::vector<std::string>())) {
            bool isOffered = offered.empty();
            for (const std::string& one : offered) {
                isOffered = isOffered || one == alias;
            }
            if (!isOffered) {
                handler(false, sdk::Error{0, "the server does not offer " + alias});
                return;
            }
        }
        std::thread([handler, duration = delay(response)] {
            std::this_thread::sleep_for(duration);
            handler(true);
        }).detach();
    }

    std::optional<std::vector<std::string>> messagingAliasesFromResponse(sdk::ValueView response) override {
        return offeredAliases(response);
    }
};

} // namespace

WL_EXPORT_DELEGATE_PLUGIN(Vidlink)
