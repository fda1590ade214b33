// A delegate plug-in as an author outside the project writes one.

#include <welcomer/DelegatePlugin.hpp>

namespace {

using namespace welcomer::sdk;

class Outside final : public WLFirstRunDelegateConfiguration {
  public:
    std::optional<std::string> delegateIdentifier() override { return "org.example.outside"; }
    std::optional<Value> delegateSetupRequest() override {
        Value request = Value::dictionary();
        request.set("version", 1);
        return request;
    }
    void completeSetupWithResponseHandler(ValueView response, CompletionHandler handler) override {
        handler(static_cast<bool>(response));
    }
};

} // namespace

WL_EXPORT_DELEGATE_PLUGIN(Outside)
