// A delegate that loses its handler. How, says the response: "at once", "on another thread", "when it throws", "in a
// copy", or not at all: "called".

#include <welcomer/DelegatePlugin.hpp>

#include <dlfcn.h>
#include <functional>
#include <optional>
#include <stdexcept>
#include <string>
#include <thread>
#include <utility>

namespace sdk = welcomer::sdk;

namespace {

// The part of this library's file name before the first point.
std::string ownName() {
    Dl_info library{};
    if (::dladdr(reinterpret_cast<const void*>(&ownName), &library) == 0) {
        return "";
    }
    const std::string path = library.dli_fname;
    const std::string name = path.substr(path.rfind('/') + 1);
    return name.substr(0, name.find('.'));
}

class Dropping : public sdk::WLFirstRunDelegateConfiguration {
  public:
    std::optional<std::string> delegateIdentifier() override { return "org.example." + ownName(); }
    std::optional<sdk::Value> delegateSetupRequest() override { return std::nullopt; }

    void completeSetupWithResponseHandler(sdk::ValueView response, sdk::CompletionHandler handler) override {
        const std::string how = response.string().value_or("");
        if (how == "on another thread") {
            std::thread([moved = std::move(handler)] { static_cast<void>(moved); }).detach();
        } else if (how == "when it throws") {
            const std::function<void()> kept = [handler] {
                handler(true);
            };
            throw std::runtime_error("thrown with the handler");
        } else if (how == "in a copy") {
            _kept = handler;
            _kept.reset();
        } else if (how == "called") {
            handler(true);
        }
    }

  private:
    std::optional<sdk::CompletionHandler> _kept;
};

} // namespace

WL_EXPORT_DELEGATE_PLUGIN(Dropping)
