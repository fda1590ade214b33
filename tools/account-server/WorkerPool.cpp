#include "tools/account-server/WorkerPool.h"

#include <utility>

namespace welcomer::server {

WorkerPool::WorkerPool(std::size_t threads, std::size_t queueLimit) : _queueLimit(queueLimit) {
    for (std::size_t i = 0; i < threads; ++i) {
        _threads.emplace_back([this] { _run(); });
    }
}

WorkerPool::~WorkerPool() {
    {
        const std::lock_guard lock(_mutex);
        _ends = true;
    }
    _changed.notify_all();
}

bool WorkerPool::take(std::function<void()> work) {
    {
        const std::lock_guard lock(_mutex);
        // What an idle thread is about to fetch does not wait.
        if (_queue.size() >= _queueLimit + _idle) {
            return false;
        }
        _queue.push_back(std::move(work));
    }
    _changed.notify_one();
    return true;
}

void WorkerPool::_run() {
    std::unique_lock lock(_mutex);
    while (true) {
        ++_idle;
        _changed.wait(lock, [this] { return _ends || !_queue.empty(); });
        --_idle;
        if (_queue.empty()) {
            return;
        }
        const std::function<void()> work = std::move(_queue.front());
        _queue.pop_front();
        lock.unlock();
        work();
        lock.lock();
    }
}

} // namespace welcomer::server
