// A plug-in under the eyes of a check: called across the boundary as it stands, with nothing between that would mend it.

#pragma once

#include "propertylist/PropertyList.h"
#include "sdk/welcomer/delegate_plugin.h"
#include "tools/welcomer/plugins/CheckReport.h"

#include <atomic>
#include <functional>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

namespace welcomer::tool {

// How a call into the plug-in ended.
struct CallEnd {
    std::optional<std::string> raised; // the message
    std::optional<std::string> thrown; // the exception that left it, with its text
    bool hasEndedThread = false;
};

// Made in a process of its own for each check. What it makes lives until the process ends.
class CheckedPlugin {
  public:
    //  name    of its entry in the plug-in directory of the platform
    //  report  borrowed
    CheckedPlugin(std::string name, CheckReport& report) : _name(std::move(name)), _report(report) {}

    // Loads it.
    //  result  why not; empty when it is loaded
    std::string load();

    // What it exports, once it is loaded.
    const wl_delegate_plugin_descriptor& descriptor() const { return *_descriptor; }

    // Makes an instance. Null where it makes none, raises or throws.
    wl_delegate* create(const wl_host& host);
    // The last one that was made.
    wl_delegate* instance() const { return _instance; }
    void destroy();

    // The identifier; none where it gives none, raises or throws. Any thread, once one call has returned.
    std::optional<std::string> identifier();

    // The request as the host would take it; none as above. Any thread.
    std::optional<PropertyList> request();
    std::optional<PropertyList> aliases(const PropertyList& response);

    // A completion, on a thread of its own; a delegate that gets aliases gets these.
    CallEnd complete(const PropertyList& response, const PropertyList* aliases);
    void terminate();

    // Whether it is one of the delegates that get the chosen aliases.
    bool getsAliases() const { return _getsAliases; }

    // How each call so far has ended, where that was not well, with the operation's name before it.
    // Any thread.
    std::vector<std::string> thrown() const;
    std::vector<std::string> raised() const;
    bool hasEndedThread() const { return _hasEndedThread; }

    // Called behind each call, with the operation's name. Null for nothing.
    std::function<void(const std::string& operation)> afterCall;

  private:
    template <class Call>
    auto _call(const std::string& operation, CallEnd& end, Call call) -> decltype(call(nullptr));
    void _keep(const std::string& operation, const CallEnd& end);

    const std::string _name;
    CheckReport& _report;
    const wl_delegate_plugin_descriptor* _descriptor = nullptr;
    wl_delegate* _instance = nullptr;
    std::atomic<bool> _isIdentified{false};
    bool _getsAliases = false;
    std::vector<std::string> _thrown;
    std::vector<std::string> _raised;
    std::atomic<bool> _hasEndedThread{false};
    mutable std::mutex _mutex; // of the two lists
};

} // namespace welcomer::tool
