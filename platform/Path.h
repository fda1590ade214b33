// Paths: joining their parts, and one that several rooms look at.

#pragma once

#include <string>
#include <string_view>

namespace welcomer::platform {

// A folder that only the maker's own machines have.
inline constexpr char kInternalMarker[] = "/CorvidInternal";

// A folder's path and a path below it, with one slash between the two. Any thread.
inline std::string joinPath(std::string folder, std::string_view below) {
    if (!folder.ends_with('/')) {
        folder += '/';
    }
    return folder.append(below);
}

} // namespace welcomer::platform
