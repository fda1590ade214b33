// The whole story: a machine is made below a folder, a user is set up on it, and logs in twice.

#pragma once

#include "tools/welcomer/cli/Tool.h"
#include "tools/welcomer/login/LoginRecord.h"
#include "tools/welcomer/terminal/InterruptionGuard.h"

#include <filesystem>

namespace welcomer::tool {

// Tells people the story while it goes on.
//  timeLapse   the agent runs on simulated time
//  server      the program of an account server that the user signs in with; empty: the machine's own directory
//  root        the folder of the machine
//  firstLogin  receives what happened at the first login
//  result      the document, with a failure where a login did not do its part
// Throws CommandFailure where it cannot go on, and Interrupted. Main thread, no other thread running.
Report tellStory(Session& session, bool timeLapse, const std::filesystem::path& server,
                 const std::filesystem::path& root, InterruptionGuard& guard, LoginRecord& firstLogin);

} // namespace welcomer::tool
