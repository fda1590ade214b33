#include "backends/desktop/accountserver/Interruption.h"

#include <utility>

namespace welcomer::desktop {

void Interruption::stop() {
    const std::lock_guard lock(_mutex);
    _isStopped = true;
    for (const auto& [waiting, wake] : _waiting) {
        wake();
    }
    _changed.notify_all();
}

bool Interruption::isStopped() {
    const std::lock_guard lock(_mutex);
    return _isStopped;
}

void Interruption::wait(std::chrono::milliseconds duration) {
    std::unique_lock lock(_mutex);
    _changed.wait_for(lock, duration, [this] { return _isStopped; });
}

Interruption::Registration::Registration(Interruption& interruption, std::function<void()> wake)
    : _interruption(interruption) {
    const std::lock_guard lock(_interruption._mutex);
    if (_interruption._isStopped) {
        wake();
    }
    _interruption._waiting.emplace(this, std::move(wake));
}

Interruption::Registration::~Registration() {
    const std::lock_guard lock(_interruption._mutex);
    _interruption._waiting.erase(this);
}

} // namespace welcomer::desktop
