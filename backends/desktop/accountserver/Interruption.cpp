#include "backends/desktop/accountserver/Interruption.h"

namespace welcomer::desktop {

void Interruption::stop() {
    const std::lock_guard lock(_mutex);
    _isStopped = true;
    for (CURLM* const each : _transfers) {
        curl_multi_wakeup(each);
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

Interruption::Registration::Registration(Interruption& interruption, CURLM* transfer)
    : _interruption(interruption),
      _transfer(transfer) {
    const std::lock_guard lock(_interruption._mutex);
    _interruption._transfers.insert(_transfer);
}

Interruption::Registration::~Registration() {
    const std::lock_guard lock(_interruption._mutex);
    _interruption._transfers.erase(_transfer);
}

} // namespace welcomer::desktop
