// Plug-ins that were built with a shared sanitizer, whose runtime a process has to begin with.

#pragma once

#include "tools/welcomer/cli/PropertyListOutput.h"

#include <filesystem>
#include <string>

namespace welcomer::tool {

// The runtime that a plug-in's library names and that this process did not begin with; empty where it names none.
std::string missingSanitizer(const std::filesystem::path& library);

// Has this program examine the plug-in once more, in a process that begins with that runtime.
//  response  the file of the response; empty for the usual one
//  result    as examinePlugin() has it
// Main thread. Throws CommandFailure.
Json examineWithSanitizer(const std::string& runtime, const std::filesystem::path& file,
                          const std::string& response);

} // namespace welcomer::tool
