// What is in the plug-in directory, as a process of its own finds it.

#pragma once

#include "tools/welcomer/cli/PlatformFactory.h"
#include "tools/welcomer/cli/PropertyListOutput.h"
#include "tools/welcomer/terminal/InterruptionGuard.h"

#include <string>

namespace welcomer::tool {

inline constexpr char kLoaded[] = "loaded"; // the state of a plug-in that was

// Loads every plug-in of the machine. One that ends the process, or holds it up for ten seconds, is left out of the next
// one, so that the others are seen all the same.
//  root    the folder below which the directory is
//  result  a record for each entry, in the order in which they were met: "identifier" (or null), "file", and "state"
// The system's log lines go to the log of the platform that is installed. Main thread, no other thread running. Throws
// CommandFailure when no process can be made, and Interrupted.
Json listPlugins(const PlatformFactory& buildPlatform, const std::string& root, InterruptionGuard& guard);

} // namespace welcomer::tool
