// Copying a folder, with errors that name the path and the system's reason.

#pragma once

#include <filesystem>

namespace welcomer::tool {

// Makes a folder and those above it that are missing. Throws CommandFailure.
//  result  whether it was missing
bool makeFolders(const std::filesystem::path& folder);

// Copies a file, or a folder with all that is in it, over what is there. Links are followed. Throws
// CommandFailure, which names what could not be read or written; what was copied by then stays.
//  destination  the copy's own path; the folder that it is in is there
void copyTree(const std::filesystem::path& source, const std::filesystem::path& destination);

} // namespace welcomer::tool
