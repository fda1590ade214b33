// Time.

#pragma once

#include <chrono>

namespace welcomer::platform {

class Clock {
  public:
    virtual ~Clock() = default;

    // Monotonic time since an unspecified moment. Any thread.
    virtual std::chrono::nanoseconds now() = 0;

    // Blocks the calling thread; returns at once for nothing or less. Any thread.
    virtual void sleep(std::chrono::nanoseconds duration) = 0;
};

} // namespace welcomer::platform
