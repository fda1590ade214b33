#include "backends/local/time/LocalClock.h"

#include <algorithm>
#include <thread>

namespace welcomer::local {

using std::chrono::nanoseconds;
using std::chrono::steady_clock;

nanoseconds LocalClock::now() {
    return steady_clock::now().time_since_epoch();
}

void LocalClock::sleep(nanoseconds duration) {
    std::this_thread::sleep_until(momentAfter(duration));
}

steady_clock::time_point momentAfter(nanoseconds duration) {
    const steady_clock::time_point now = steady_clock::now();
    duration = std::max(duration, nanoseconds::zero());
    return duration < steady_clock::time_point::max() - now ? now + duration
                                                            : steady_clock::time_point::max();
}

} // namespace welcomer::local
