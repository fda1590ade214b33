// One check in a process of its own.

#pragma once

#include "tools/welcomer/cli/PlatformFactory.h"
#include "tools/welcomer/plugins/PluginChecks.h"
#include "tools/welcomer/terminal/InterruptionGuard.h"

#include <string>

namespace welcomer::tool {

struct CheckOutcome {
    std::string findings; // what is wrong, one line; empty where nothing is
    std::string seen;     // what there is to say otherwise; may be empty
};

// Makes a check: that its process ends by a signal or an exit, or takes longer than five seconds, is a finding where the
// check says so. What the plug-in writes to the standard output and error goes nowhere, but for what says why it ended.
//  root  the folder that the plug-in is installed below
// Main thread, no other thread running. Throws CommandFailure when no process can be made, and Interrupted.
CheckOutcome runCheck(const PlatformFactory& buildPlatform, const std::string& root, InterruptionGuard& guard,
                      const PluginCheck& check, const CheckInput& input);

} // namespace welcomer::tool
