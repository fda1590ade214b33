#include "backends/local/time/LocalDispatchQueues.h"

#include "backends/local/time/LocalClock.h"
#include "backends/local/time/LocalWorkGroup.h"
#include "backends/posix/AlternateStack.h"

#include <condition_variable>
#include <cstdint>
#include <deque>
#include <exception>
#include <map>
#include <mutex>
#include <thread>
#include <utility>

namespace welcomer::local {

namespace {

using std::chrono::steady_clock;
using Block = std::function<void()>;
using Lock = std::unique_lock<std::mutex>;

void call(const Block& block) noexcept {
    block();
}

bool startDetachedThread(Block function) {
    try {
        std::thread([function = std::move(function)] {
            const posix::AlternateStack stack;
            function();
        }).detach();
        return true;
    } catch (const std::exception&) {
        return false;
    }
}

// The blocks of one serial queue; guarded by the pool's mutex.
struct SerialBlocks {
    std::deque<Block> waiting;
    bool isScheduled = false; // ready, or a thread is running one of its blocks
};

// Something that a thread can take: the next block of a serial queue, or a block of the global queue.
struct Work {
    std::shared_ptr<SerialBlocks> serial;
    Block block;
};

} // namespace

class LocalDispatchQueues::Pool : public std::enable_shared_from_this<Pool> {
  public:
    explicit Pool(ThreadStarter startThread) : _startThread(std::move(startThread)) {}

    //  serial  null for the global queue
    void post(const std::shared_ptr<SerialBlocks>& serial, Block block);
    void postAfter(std::chrono::nanoseconds delay, const std::shared_ptr<SerialBlocks>& serial, Block block);
    void close();

  private:
    // Every function below is called with the mutex held; those that take the lock may let go of it
    // meanwhile.

    void _makeReady(Work work);
    void _makeDueReady();
    bool _mustKeepTime() const;
    void _startWorker(Lock& lock);
    void _startWorkerOrRunHere(Lock& lock);
    void _runNext(Lock& lock);

    // What each worker does until there is nothing left to do.
    void _work(Lock& lock, bool mayKeepTime);

    const ThreadStarter _startThread;

    std::mutex _mutex;
    std::deque<Work> _ready;
    std::multimap<steady_clock::time_point, Work> _delayed; // equal moments keep the order of posting
    int _workers = 0;                                       // threads, the one on its way among them
    bool _isStarting = false;                               // one is on its way
    bool _isTimeKept = false; // one sleeps until the earliest delayed block is due
    bool _isClosed = false;
    std::condition_variable _timekeeperIsNeeded;
    std::condition_variable _workersAreGone;
};

void LocalDispatchQueues::Pool::post(const std::shared_ptr<SerialBlocks>& serial, Block block) {
    Lock lock(_mutex);
    if (_isClosed) {
        return;
    }
    _makeReady({serial, std::move(block)});
    _startWorkerOrRunHere(lock);
}

void LocalDispatchQueues::Pool::postAfter(std::chrono::nanoseconds delay,
                                          const std::shared_ptr<SerialBlocks>& serial, Block block) {
    if (delay <= std::chrono::nanoseconds::zero()) {
        post(serial, std::move(block));
        return;
    }
    Lock lock(_mutex);
    if (_isClosed) {
        return;
    }
    const auto added = _delayed.emplace(momentAfter(delay), Work{serial, std::move(block)});
    if (added == _delayed.begin()) {
        _timekeeperIsNeeded.notify_one();
    }
    _startWorkerOrRunHere(lock);
}

void LocalDispatchQueues::Pool::_makeReady(Work work) {
    if (!work.serial) {
        _ready.push_back(std::move(work));
        return;
    }
    work.serial->waiting.push_back(std::move(work.block));
    if (std::exchange(work.serial->isScheduled, true)) {
        return;
    }
    _ready.push_back({std::move(work.serial), nullptr});
}

void LocalDispatchQueues::Pool::_makeDueReady() {
    if (_delayed.empty()) {
        return;
    }
    const auto notDue = _delayed.upper_bound(steady_clock::now());
    for (auto due = _delayed.begin(); due != notDue; due = _delayed.erase(due)) {
        _makeReady(std::move(due->second));
    }
}

bool LocalDispatchQueues::Pool::_mustKeepTime() const {
    return !_isTimeKept && !_delayed.empty() && _delayed.begin()->first != steady_clock::time_point::max();
}

void LocalDispatchQueues::Pool::_startWorker(Lock& lock) {
    if (_isClosed || _isStarting || (_ready.empty() && !_mustKeepTime())) {
        return;
    }
    _isStarting = true;
    ++_workers;
    lock.unlock();
    const bool started = _startThread([pool = shared_from_this()] {
        Lock workersLock(pool->_mutex);
        pool->_isStarting = false;
        pool->_work(workersLock, true);
    });
    lock.lock();
    if (started) {
        return;
    }
    _isStarting = false;
    --_workers;
    _workersAreGone.notify_all();
    _timekeeperIsNeeded.notify_one(); // the only one that may be free
}

void LocalDispatchQueues::Pool::_startWorkerOrRunHere(Lock& lock) {
    _startWorker(lock);
    if (_workers > 0 || _ready.empty() || _isClosed) {
        return;
    }
    ++_workers;
    _work(lock, false);
}

void LocalDispatchQueues::Pool::_work(Lock& lock, bool mayKeepTime) {
    while (!_isClosed) {
        _makeDueReady();
        if (!_ready.empty()) {
            _runNext(lock);
        } else if (mayKeepTime && _mustKeepTime()) {
            _isTimeKept = true;
            const steady_clock::time_point earliest = _delayed.begin()->first;
            _timekeeperIsNeeded.wait_until(lock, earliest);
            _isTimeKept = false;
        } else {
            break;
        }
    }
    --_workers;
    _workersAreGone.notify_all();
}

void LocalDispatchQueues::Pool::_runNext(Lock& lock) {
    Work work = std::move(_ready.front());
    _ready.pop_front();
    if (work.serial) {
        work.block = std::move(work.serial->waiting.front());
        work.serial->waiting.pop_front();
    }
    _startWorker(lock);
    lock.unlock();
    call(work.block);
    work.block = nullptr; // without the mutex: it may hold a queue, or post when it is released
    lock.lock();
    if (!work.serial) {
        return;
    }
    if (work.serial->waiting.empty()) {
        work.serial->isScheduled = false;
    } else
        _ready.push_back(std::move(work));
}

void LocalDispatchQueues::Pool::close() {
    std::deque<Work> ready;
    std::multimap<steady_clock::time_point, Work> delayed;
    std::deque<std::deque<Block>> serialBlocks;
    Lock lock(_mutex);
    _isClosed = true;
    _timekeeperIsNeeded.notify_one();
    _workersAreGone.wait(lock, [this] { return _workers == 0; });
    ready.swap(_ready);
    delayed.swap(_delayed);
    for (const Work& work : ready) {
        if (work.serial) {
            serialBlocks.push_back(std::exchange(work.serial->waiting, {}));
        }
    }
    lock.unlock(); // what the blocks hold is released without the mutex
}

class LocalDispatchQueues::Queue final : public platform::DispatchQueue {
  public:
    Queue(std::shared_ptr<Pool> pool, std::shared_ptr<SerialBlocks> serial)
        : _pool(std::move(pool)),
          _serial(std::move(serial)) {}

    void async(Block block) override { _pool->post(_serial, std::move(block)); }

    void asyncAfter(std::chrono::nanoseconds delay, Block block) override {
        _pool->postAfter(delay, _serial, std::move(block));
    }

  private:
    const std::shared_ptr<Pool> _pool;
    const std::shared_ptr<SerialBlocks> _serial;
};

LocalDispatchQueues::LocalDispatchQueues() : LocalDispatchQueues(startDetachedThread) {}

LocalDispatchQueues::LocalDispatchQueues(ThreadStarter startThread)
    : _pool(std::make_shared<Pool>(std::move(startThread))),
      _global(std::make_unique<Queue>(_pool, nullptr)) {}

LocalDispatchQueues::~LocalDispatchQueues() {
    _pool->close();
}

std::shared_ptr<platform::DispatchQueue> LocalDispatchQueues::createSerial(const std::string&) {
    return std::make_shared<Queue>(_pool, std::make_shared<SerialBlocks>());
}

platform::DispatchQueue& LocalDispatchQueues::global() {
    return *_global;
}

std::shared_ptr<platform::WorkGroup> LocalDispatchQueues::createGroup() {
    return std::make_shared<LocalWorkGroup>();
}

} // namespace welcomer::local
