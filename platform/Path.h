// Joining the parts of a path.

#pragma once

#include <string>
#include <string_view>

namespace welcomer::platform {

// A folder's path and a path below it, with one slash between the two. Any thread.
inline std::string joinPath(std::string folder, std::string_view below) {
    if (!folder.ends_with('/')) {
        folder += '/';
    }
    return folder.append(below);
}

} // namespace welcomer::platform
