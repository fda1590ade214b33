// Whether a text is one of several.

#pragma once

#include <algorithm>
#include <string>
#include <string_view>
#include <vector>

namespace welcomer::text {

// Any thread.
inline bool contains(const std::vector<std::string>& texts, std::string_view text) {
    return std::ranges::find(texts, text) != texts.end();
}

} // namespace welcomer::text
