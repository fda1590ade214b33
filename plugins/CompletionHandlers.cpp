#include "plugins/CompletionHandlers.h"

#include "plugins/PluginText.h"

#include <cstdint>
#include <mutex>
#include <random>
#include <unordered_map>
#include <utility>

namespace welcomer {

namespace {

using Handler = WLFirstRunDelegateConfiguration::CompletionHandler;

class HandlerTable {
  public:
    std::uint64_t add(Handler handler) {
        const std::lock_guard lock(_mutex);
        std::uint64_t number = 0;
        do {
            number = std::uint64_t{_random()} << 32 | _random();
        } while (number == 0 || _handlers.contains(number));
        _handlers.emplace(number, std::move(handler));
        return number;
    }

    // The handler, which is then no longer in the table; empty when it is spent or was never there.
    Handler take(std::uint64_t number) {
        const std::lock_guard lock(_mutex);
        const auto node = _handlers.extract(number);
        return node ? std::move(node.mapped()) : Handler();
    }

  private:
    std::mutex _mutex;
    std::unordered_map<std::uint64_t, Handler> _handlers;
    std::random_device _random; // the system's own
};

// Never destroyed: plug-in threads may still call while the process ends.
HandlerTable& handlerTable() {
    static auto* const table = new HandlerTable;
    return *table;
}

extern "C" {

static void callHandler(std::uint64_t context, bool succeeded, std::int32_t errorNumber,
                        const char* errorMessage) {
    try {
        if (const Handler handler = handlerTable().take(context)) {
            std::optional<platform::Error> error;
            if (errorMessage) {
                error = platform::Error{errorNumber, pluginText(errorMessage)};
            }
            handler(succeeded, error);
        }
    } catch (...) {
        // The plug-in below has no use for what went wrong here.
    }
}
}

} // namespace

wl_completion_handler issueCompletionHandler(Handler handler) {
    return {callHandler, handlerTable().add(std::move(handler))};
}

void revokeCompletionHandler(const wl_completion_handler& handler) {
    handlerTable().take(handler.context);
}

} // namespace welcomer
