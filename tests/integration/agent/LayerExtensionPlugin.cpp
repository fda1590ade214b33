// The same over the C++ layer. Its name says how it ends: "waiting" never answers.

#include <welcomer/Extensions.hpp>

#include <dlfcn.h>
#include <memory>
#include <stdexcept>
#include <string>

namespace sdk = welcomer::sdk;

namespace {

class Extended : public sdk::WLFirstRunDelegateConfiguration {
  public:
    Extended() {
        tell("being made");
        if (sdk::dispatch(*this, 0, [] {}) != 0) {
            tell("takes a block before it is made");
        }
    }

    std::optional<std::string> delegateIdentifier() override {
        return doesWait() ? "org.example.waiting" : "org.example.layered";
    }
    std::optional<sdk::Value> delegateSetupRequest() override { return std::nullopt; }

    void completeSetupWithResponseHandler(sdk::ValueView /*response*/,
                                          sdk::CompletionHandler handler) override {
        const sdk::Context context = sdk::context().value();
        tell("account " + context.accountName.value_or("(none)") + ", home " +
             context.homeFolder.value_or("(none)") + ", root " + context.rootFolder +
             (context.isTrial ? ", trial" : ", real"));
        sdk::reportProgress(*this, 0.25, "waiting");
        if (doesWait()) {
            _kept = std::make_unique<sdk::CompletionHandler>(handler);
            return;
        }
        sdk::dispatch(*this, 0, [] { throw std::runtime_error("thrown in a block"); });
        const auto held = std::make_shared<std::string>("held by a block");
        const std::uint64_t number = sdk::dispatch(*this, 60, [held] {});
        tell(std::to_string(held.use_count()) + " hold it");
        tell(sdk::cancel(*this, number) && held.use_count() == 1 ? "cancelled and let go" : "still held");
        sdk::dispatch(*this, 0.1, [this, handler] {
            tell("a block");
            handler(true);
        });
    }

  private:
    void tell(const std::string& text) const { sdk::log(*this, sdk::LogLevel::Information, text); }

    static bool doesWait() {
        static const char here = 0;
        Dl_info library{};
        return ::dladdr(&here, &library) != 0 &&
               std::string(library.dli_fname).find("/waiting.") != std::string::npos;
    }

    std::unique_ptr<sdk::CompletionHandler> _kept;
};

} // namespace

WL_EXPORT_DELEGATE_PLUGIN(Extended)
