// A plug-in that is put onto a machine that is made up.

#pragma once

#include <filesystem>

namespace welcomer::tool {

// Copies a plug-in into the folder of plug-ins, under its own name with the ending of plug-ins. The copy is for nobody
// else to write: how a plug-in is installed is its packager's business, not the trial's.
//  source  a library or a folder, of any name
//  folder  is there
// Throws CommandFailure, also where a plug-in of that name is there already.
void installPlugin(const std::filesystem::path& source, const std::filesystem::path& folder);

} // namespace welcomer::tool
