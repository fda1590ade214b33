// A time as people give it on the command line.

#pragma once

#include <chrono>
#include <optional>
#include <string_view>

namespace welcomer::tool {

// "2026-11-22", "2026-11-22 11:06", "2026-11-22 11:06:33", "11:06", "11:06:33", "today" or "yesterday", in this
// machine's time zone, or how long ago: "30s", "10m", "2h", "3d".
//  now     since 1970, as the result is
//  result  none for what is no time
// Any thread.
std::optional<std::chrono::microseconds> readSince(std::string_view text, std::chrono::microseconds now);

} // namespace welcomer::tool
