// Time.

#pragma once

#include <chrono>

namespace welcomer::platform {

// Any thread.
class Clock {
  public:
    virtual ~Clock() = default;

    // Monotonic time since an unspecified moment.
    virtual std::chrono::nanoseconds now() = 0;

    // Blocks the calling thread; returns at once for nothing or less.
    virtual void sleep(std::chrono::nanoseconds duration) = 0;
};

} // namespace welcomer::platform
