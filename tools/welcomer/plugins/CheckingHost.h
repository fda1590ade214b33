// The host's table of functions for a plug-in that is being checked.

#pragma once

#include "sdk/welcomer/delegate_plugin.h"

#include <cstdint>
#include <mutex>
#include <string>
#include <vector>

namespace welcomer::tool {

// What delegatePluginHost() has, by way of the HandleBook. Lives until the process ends. Any thread.
const wl_host& checkingHost();

// The same as a host of the first version knows it: what lies behind is not for a plug-in to call.
const wl_host& firstCheckingHost();
bool wasCalledBeyondFirst();

// One call of a completion handler.
struct HandlerCall {
    bool isOwnContext; // it came with the context that was given
    bool succeeded;
    bool hasMessage;
    std::string message;
};

// The one completion handler of a process that checks a plug-in. Any thread.
class CheckedHandler {
  public:
    static CheckedHandler& instance();

    wl_completion_handler handler() const;
    void note(std::uint64_t context, bool succeeded, const char* message);
    std::vector<HandlerCall> calls() const;

  private:
    mutable std::mutex _mutex;
    std::vector<HandlerCall> _calls;
};

} // namespace welcomer::tool
