// Installing the launch agent that has the agent run at the user's next login.

#pragma once

#include "platform/ResourceBundle.h"

namespace welcomer {

// Copies the launch-agent file into the folder of the user's launch agents, which is made where it is missing.
//  bundle  the setup application's bundle, with the resource "com.corvid.welcomer.nimbussetup.user.plist"
//  result  whether the file was copied; else one log line says why. A file that is there already is not
//          replaced.
// For the user whom the process runs as, on any thread.
bool installLaunchAgent(platform::ResourceBundle& bundle);

} // namespace welcomer
