// Throws when it is loaded.

#include <welcomer/DelegatePlugin.hpp>

#include <stdexcept>

namespace {

int thrown() {
    throw std::runtime_error("no such table");
}

const int table = thrown();

} // namespace

class Throwing : public welcomer::sdk::WLFirstRunDelegateConfiguration {
  public:
    std::optional<std::string> delegateIdentifier() override { return "org.example.broken"; }
    std::optional<welcomer::sdk::Value> delegateSetupRequest() override { return std::nullopt; }
    void completeSetupWithResponseHandler(welcomer::sdk::ValueView,
                                          welcomer::sdk::CompletionHandler handler) override {
        handler(true);
    }
};

WL_EXPORT_DELEGATE_PLUGIN(Throwing)
