// Everything that a plug-in in C++ includes and uses, for every standard and compiler, with and without exceptions.

#include <welcomer/DelegatePlugin.hpp>
#include <welcomer/Extensions.hpp>

namespace sdk = welcomer::sdk;

namespace {

class Use : public sdk::WLFirstRunDelegateConfiguration {
  public:
    std::optional<std::string> delegateIdentifier() override { return "org.example.use"; }

    std::optional<sdk::Value> delegateSetupRequest() override {
        sdk::Value list = sdk::Value::array();
        list.append("text").append(1).append(2U).append(1.5).append(true).append(sdk::Value::data("bytes"));
        sdk::Value request = sdk::Value::dictionary();
        request.set("list", std::move(list)).set("date", sdk::Value::date(0));
        return request;
    }

    void completeSetupWithResponseHandler(sdk::ValueView response, sdk::CompletionHandler handler) override {
        std::size_t texts = 0;
        response.forEach([&](std::string_view, sdk::ValueView value) { texts += value.string() ? 1U : 0U; });
        sdk::log(*this, sdk::LogLevel::Debug, std::to_string(texts));
        sdk::reportProgress(*this, 0.5, sdk::context() ? "known" : "unknown");
        const std::uint64_t number = sdk::dispatch(*this, 1, [handler] {
            handler(false, sdk::Error{1, "late"});
        });
        if (sdk::cancel(*this, number)) {
            handler(true);
        }
    }
};

} // namespace

WL_EXPORT_DELEGATE_PLUGIN(Use)
