#include "backends/local/time/LocalRunLoops.h"

#include "backends/local/time/LocalClock.h"

#include <condition_variable>
#include <cstddef>
#include <cstdint>
#include <deque>
#include <mutex>
#include <utility>

namespace welcomer::local {

namespace {

using std::chrono::steady_clock;

// Blocks must not throw: one that does ends the process.
void call(const std::function<void()>& block) noexcept {
    block();
}

class LocalRunLoop final : public platform::RunLoop, public std::enable_shared_from_this<LocalRunLoop> {
  public:
    void run(std::chrono::nanoseconds duration) override;
    void perform(std::function<void()> block) override;
    std::unique_ptr<platform::RunLoopPort> attachPort() override;

    void addPort();
    void removePort();

    // Releases what is pending, now and from now on.
    void close();

  private:
    void _runPendingBlocks(std::unique_lock<std::mutex>& lock);

    std::mutex _mutex;
    std::condition_variable _changed;
    std::deque<std::function<void()>> _pending;
    std::uint64_t _taken = 0; // blocks taken off _pending so far
    int _ports = 0;
    bool _isClosed = false;
};

class Port final : public platform::RunLoopPort {
  public:
    explicit Port(std::shared_ptr<LocalRunLoop> loop) : _loop(std::move(loop)) { _loop->addPort(); }
    ~Port() override { _loop->removePort(); }
    Port(const Port&) = delete;
    Port& operator=(const Port&) = delete;

  private:
    const std::shared_ptr<LocalRunLoop> _loop;
};

void LocalRunLoop::run(std::chrono::nanoseconds duration) {
    const steady_clock::time_point deadline = momentAfter(duration);
    std::unique_lock lock(_mutex);
    for (;;) {
        _runPendingBlocks(lock);
        const auto hasNews = [this] {
            return !_pending.empty() || _ports == 0;
        };
        if (_pending.empty() && _ports == 0) {
            return;
        }
        if (steady_clock::now() >= deadline || !_changed.wait_until(lock, deadline, hasNews)) {
            return;
        }
    }
}

// Leaves those alone that are performed meanwhile. A block may run the loop itself and so take the ones after
// it.
void LocalRunLoop::_runPendingBlocks(std::unique_lock<std::mutex>& lock) {
    const std::uint64_t end = _taken + _pending.size();
    while (_taken < end) {
        std::function<void()> block = std::move(_pending.front());
        _pending.pop_front();
        ++_taken;
        lock.unlock();
        call(block);
        block = nullptr; // without the mutex: it may hold a port of this loop
        lock.lock();
    }
}

void LocalRunLoop::perform(std::function<void()> block) {
    const std::lock_guard lock(_mutex);
    if (_isClosed) {
        return;
    }
    _pending.push_back(std::move(block));
    _changed.notify_one();
}

std::unique_ptr<platform::RunLoopPort> LocalRunLoop::attachPort() {
    return std::make_unique<Port>(shared_from_this());
}

void LocalRunLoop::addPort() {
    const std::lock_guard lock(_mutex);
    ++_ports;
}

void LocalRunLoop::removePort() {
    const std::lock_guard lock(_mutex);
    if (--_ports == 0) {
        _changed.notify_one();
    }
}

void LocalRunLoop::close() {
    std::deque<std::function<void()>> dropped;
    const std::lock_guard lock(_mutex);
    _isClosed = true;
    dropped.swap(_pending);
}

// Closes a thread's loop when the thread ends.
struct ThreadsLoop {
    ThreadsLoop() = default;
    ~ThreadsLoop() { loop->close(); }
    ThreadsLoop(const ThreadsLoop&) = delete;
    ThreadsLoop& operator=(const ThreadsLoop&) = delete;

    const std::shared_ptr<LocalRunLoop> loop = std::make_shared<LocalRunLoop>();
};

} // namespace

std::shared_ptr<platform::RunLoop> LocalRunLoops::current() {
    static thread_local const ThreadsLoop own;
    return own.loop;
}

} // namespace welcomer::local
