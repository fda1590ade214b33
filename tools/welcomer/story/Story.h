// The whole story: a machine is made below a folder, a user is set up on it, and logs in twice.

#pragma once

#include "propertylist/PropertyList.h"
#include "tools/welcomer/cli/Tool.h"
#include "tools/welcomer/login/LoginRecord.h"
#include "tools/welcomer/terminal/InterruptionGuard.h"

#include <filesystem>
#include <vector>

namespace welcomer::tool {

struct StoryOptions {
    bool timeLapse = false;       // the agent runs on simulated time
    std::filesystem::path server; // the account server's program; empty: the machine's directory
    std::vector<std::filesystem::path> plugins; // beside the examples
    PropertyList::Dictionary responses; // that the server gives, by delegate; beside those of the examples
};

// Tells people the story while it goes on.
//  root        the folder of the machine
//  firstLogin  receives what happened at the first login
//  result      the document, with a failure where a login did not do its part
// Throws CommandFailure where it cannot go on, and Interrupted. Main thread, no other thread running.
Report tellStory(Session& session, const StoryOptions& options, const std::filesystem::path& root,
                 InterruptionGuard& guard, LoginRecord& firstLogin);

} // namespace welcomer::tool
