// The agent's first step: it never starts at a login again.

#pragma once

#include <string>

namespace welcomer {

// Removes the launch-agent file "<label>.plist" from the user's LaunchAgents folder. What cannot be removed
// is logged, also when it is gone already. The running launch job stays as it is.
//  label  the launch agent's label, UTF-8
// Main thread.
void selfDestruct(const std::string& label);

} // namespace welcomer
