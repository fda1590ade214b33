// Runs the checks over a plug-in, and puts together what each has seen.

#pragma once

#include "propertylist/PropertyList.h"
#include "tools/welcomer/cli/PlatformFactory.h"
#include "tools/welcomer/cli/PropertyListOutput.h"
#include "tools/welcomer/terminal/InterruptionGuard.h"

#include <filesystem>

namespace welcomer::tool {

inline constexpr char kPassed[] = "passed";
inline constexpr char kWarned[] = "warned";
inline constexpr char kFailed[] = "failed";
inline constexpr char kSkipped[] = "skipped"; // for want of what another check asks for

// The library of a plug-in, which may be a folder; where that does not say it, the folder.
std::filesystem::path libraryOfPlugin(const std::filesystem::path& plugin);

// Makes every check, each in a process of its own, which gets five seconds, below a temporary folder that is removed
// afterwards.
//  file      a library or a folder, of any name
//  response  what it is to complete with
//  result    one record a check: "name", "verdict", "seen" (or null) and "documented"
// Main thread, no other thread running. Throws CommandFailure, and Interrupted.
Json examinePlugin(const PlatformFactory& buildPlatform, const std::filesystem::path& file,
                   const PropertyList& response, InterruptionGuard& guard);

} // namespace welcomer::tool
