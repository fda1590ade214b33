#include "backends/local/time/LocalWorkGroup.h"

#include "backends/local/time/LocalClock.h"

namespace welcomer::local {

void LocalWorkGroup::enter() {
    const std::lock_guard lock(_mutex);
    ++_count;
}

void LocalWorkGroup::leave() {
    const std::lock_guard lock(_mutex);
    if (_count > 0 && --_count == 0) {
        _emptied.notify_all();
    }
}

bool LocalWorkGroup::wait(std::chrono::nanoseconds timeOut) {
    const auto deadline = momentAfter(timeOut);
    std::unique_lock lock(_mutex);
    return _emptied.wait_until(lock, deadline, [this] { return _count == 0; });
}

} // namespace welcomer::local
