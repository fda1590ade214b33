// The kernel's monotonic clock.

#pragma once

#include "platform/Clock.h"

namespace welcomer::local {

class LocalClock final : public platform::Clock {
  public:
    std::chrono::nanoseconds now() override;
    void sleep(std::chrono::nanoseconds duration) override;
};

// The moment when a duration from now is over; nothing or less is over now, and what no clock reaches is
// time_point::max(). Any thread.
std::chrono::steady_clock::time_point momentAfter(std::chrono::nanoseconds duration);

} // namespace welcomer::local
