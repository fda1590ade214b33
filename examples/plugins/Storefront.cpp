// The app store's delegate: it checks what the server says of the account, on the calling thread.

#include <welcomer/DelegatePlugin.hpp>

#include <chrono>
#include <stdexcept>
#include <string>
#include <thread>

namespace sdk = welcomer::sdk;

namespace {

class Storefront : public sdk::WLFirstRunDelegateConfiguration {
  public:
    std::optional<std::string> delegateIdentifier() override { return "com.corvid.storefront"; }

    std::optional<sdk::Value> delegateSetupRequest() override {
        sdk::Value request = sdk::Value::dictionary();
        request.set("wantsRegion", true);
        return request;
    }

    // Takes "delaySeconds"; fails with the server's "error" when there is one, and raises for what it cannot
    // read.
    void completeSetupWithResponseHandler(sdk::ValueView response, sdk::CompletionHandler handler) override {
        if (response.type() != WL_VALUE_DICTIONARY) {
            throw std::invalid_argument("the response is no dictionary");
        }
        const sdk::ValueView seconds = response.find("delaySeconds");
        const double whole = static_cast<double>(seconds.integer().value_or(0));
        const double delay = seconds.type() == WL_VALUE_NONE ? 0.01 : seconds.real().value_or(whole);
        if (delay > 0 && delay < 3600) {
            std::this_thread::sleep_for(std::chrono::duration<double>(delay));
        }
        if (const auto error = response.find("error").string()) {
            handler(false, sdk::Error{0, *error});
        } else {
            handler(true);
        }
    }
};

} // namespace

WL_EXPORT_DELEGATE_PLUGIN(Storefront)
