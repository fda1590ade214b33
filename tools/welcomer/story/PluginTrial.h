// Plug-ins that are completed as at a login, on a machine that is made up.

#pragma once

#include "propertylist/PropertyList.h"
#include "tools/welcomer/cli/PlatformFactory.h"
#include "tools/welcomer/cli/PropertyListOutput.h"
#include "tools/welcomer/terminal/InterruptionGuard.h"

#include <chrono>
#include <filesystem>
#include <optional>
#include <string>
#include <vector>

namespace welcomer::tool {

struct PluginTrialOptions {
    std::vector<std::filesystem::path> plugins; // files or folders, of any name
    PropertyList response;                      // what each of them gets
    std::optional<std::vector<std::string>> aliases;
    std::string account;
    std::chrono::seconds limit{60}; // beyond which nobody waits for an answer
};

// Has the agent's own code load and complete the plug-ins, in processes of their own, below a temporary folder that is
// removed afterwards. It waits for them as the agent does, and then lingers for a second.
//  result  a document with
//          plugins    of each file its "identifier", "request", "response", "outcome", "message", "progress" and
//                     "seconds"; "state" is "loaded", or why it was not
//          threads    how many threads were seen besides the main one
//          leftRunning  "threads" and "processes" that were there at the end
//          end        how the agent ended
//          log        its lines
// Main thread, no other thread running. Throws CommandFailure, and Interrupted.
Json tryPlugins(const PlatformFactory& buildPlatform, const PluginTrialOptions& options,
                InterruptionGuard& guard);

// Whether every plug-in of such a document has completed.
bool haveCompleted(const Json& trial);

} // namespace welcomer::tool
