// Durations as the clocks and queues take them.

#pragma once

#include <chrono>
#include <cstdint>

namespace welcomer::platform {

// Seconds, truncated to whole nanoseconds; what is beyond their range is the end of it. Any thread.
//  seconds  0 or more
inline std::chrono::nanoseconds nanosecondsOf(double seconds) {
    const double count = seconds * 1e9;
    return count < static_cast<double>(std::chrono::nanoseconds::max().count())
               ? std::chrono::nanoseconds(static_cast<std::int64_t>(count))
               : std::chrono::nanoseconds::max();
}

} // namespace welcomer::platform
