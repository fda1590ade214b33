// Has a variable that is one for all plug-ins with the same name.

#include <welcomer/DelegatePlugin.hpp>

#define VISIBLE __attribute__((visibility("default")))

VISIBLE inline int sharedByAll = 0;

class Unique : public welcomer::sdk::WLFirstRunDelegateConfiguration {
  public:
    std::optional<std::string> delegateIdentifier() override { return "org.example.broken"; }
    std::optional<welcomer::sdk::Value> delegateSetupRequest() override {
        ++sharedByAll;
        return std::nullopt;
    }
    void completeSetupWithResponseHandler(welcomer::sdk::ValueView,
                                          welcomer::sdk::CompletionHandler handler) override {
        handler(true);
    }
};

WL_EXPORT_DELEGATE_PLUGIN(Unique)
