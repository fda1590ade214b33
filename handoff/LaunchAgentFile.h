// The names that the installer of the launch agent and the agent itself must agree on.

#pragma once

namespace welcomer {

// The label of the launch agent, which is also the name of its file without the ending.
inline constexpr const char* kLaunchAgentLabel = "com.corvid.welcomer.nimbussetup.user";

// The type of the resource, and the ending of the file without the dot.
inline constexpr const char* kLaunchAgentFileType = "plist";

// The folder of launch agents in a user's library folder.
inline constexpr const char* kLaunchAgentsFolder = "LaunchAgents";

// The agent's program: the name of the setup application's resource, which has no type.
inline constexpr const char* kAgentProgramName = "wlnimbussetup";

} // namespace welcomer
