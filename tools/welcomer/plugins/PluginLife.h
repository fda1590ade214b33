// What becomes of a plug-in at a login, from its loading to its answer.

#pragma once

#include "propertylist/PropertyList.h"
#include "tools/welcomer/plugins/CheckedPlugin.h"

#include <chrono>
#include <filesystem>
#include <functional>
#include <optional>

namespace welcomer::tool {

// What each check gets.
struct CheckInput {
    std::filesystem::path library; // the plug-in's own, as it was named
    std::string name;              // of its entry in the plug-in directory
    PropertyList response;         // the ordinary one
};

// How the one completion of a life goes.
struct Completion {
    PropertyList response;
    std::optional<PropertyList> aliases = PropertyList(PropertyList::Array{"someone@nimbus.example"});
    bool isTerminated = false;            // while it runs
    bool callerEnds = false;              // the thread that asked is gone while the answer is waited for
    std::chrono::milliseconds watched{0}; // how long more calls of the handler are waited for
    std::optional<std::chrono::milliseconds> patience =
        std::nullopt; // how long the first one is; none: for ever
};

// Loads a plug-in, makes an instance, and asks it for its identifier and its request.
//  result  whether there is an instance with an identifier; the reason was found then, or not, by who looks for it
// Main thread.
bool beginLife(CheckedPlugin& plugin);

// Completes it, on a thread of its own as at a login, and runs the main loop until it has answered, raised or thrown:
// for ever, or as long as there is patience, where it does none of that.
CallEnd completeLife(CheckedPlugin& plugin, CheckReport& report, const Completion& completion);

// Both, with the ordinary response, and with little patience: whether there is an answer is for others to find.
void liveLife(CheckedPlugin& plugin, CheckReport& report, const CheckInput& input);

// Runs the main loop until something is so.
void runMainLoopUntil(const std::function<bool()>& isSo);

} // namespace welcomer::tool
