// The names that the installer of the launch agent and the agent itself must agree on.

#pragma once

#include "platform/Path.h"

#include <string>
#include <string_view>

namespace welcomer {

// The label of the launch agent, which is also the name of its file without the ending.
inline constexpr char kLaunchAgentLabel[] = "com.corvid.welcomer.nimbussetup.user";

// The type of the resource, and the ending of the file without the dot.
inline constexpr char kLaunchAgentFileType[] = "plist";

// The folder of launch agents in a user's library folder.
inline constexpr char kLaunchAgentsFolder[] = "LaunchAgents";

// The folder of launch agents of the user with this home.
inline std::string launchAgentsFolder(const std::string& home) {
    return platform::joinPath(platform::joinPath(home, "Library"), kLaunchAgentsFolder);
}

// The name of a launch agent's file.
inline std::string launchAgentFileName(std::string_view label) {
    return std::string(label) + '.' + kLaunchAgentFileType;
}

// Where the launch agent of this system is installed for the user with this home.
inline std::string launchAgentPath(const std::string& home) {
    return platform::joinPath(launchAgentsFolder(home), launchAgentFileName(kLaunchAgentLabel));
}

// The agent's program: the name of the setup application's resource, which has no type.
inline constexpr char kAgentProgramName[] = "wlnimbussetup";

} // namespace welcomer
