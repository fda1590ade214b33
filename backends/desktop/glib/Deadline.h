// How long something may take, with all the calls that it consists of.

#pragma once

#include <algorithm>
#include <chrono>
#include <cstdint>
#include <limits>

namespace welcomer::desktop {

// A duration as GLib takes it, rounded up.
inline int wholeMilliseconds(std::chrono::nanoseconds duration) {
    const std::int64_t count = std::chrono::ceil<std::chrono::milliseconds>(duration).count();
    return static_cast<int>(std::clamp<std::int64_t>(count, 0, std::numeric_limits<int>::max()));
}

// One thread.
class Deadline {
  public:
    using Clock = std::chrono::steady_clock;

    explicit Deadline(std::chrono::nanoseconds limit) : _end(Clock::now() + limit) {}

    // What is left; never negative.
    std::chrono::nanoseconds left() const {
        return std::max<std::chrono::nanoseconds>(_end - Clock::now(), std::chrono::nanoseconds(0));
    }

    // Does not count the time that a person took to answer.
    void add(std::chrono::nanoseconds duration) { _end += duration; }

  private:
    Clock::time_point _end;
};

} // namespace welcomer::desktop
