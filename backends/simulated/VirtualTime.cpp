#include "backends/simulated/VirtualTime.h"

#include <algorithm>
#include <atomic>
#include <condition_variable>
#include <cstdint>
#include <functional>
#include <limits>
#include <map>
#include <mutex>
#include <optional>
#include <set>
#include <tuple>
#include <utility>

namespace welcomer::simulated {

namespace {

using std::chrono::nanoseconds;
using Lock = std::unique_lock<std::mutex>;

// A moment that no clock reaches.
constexpr nanoseconds kNever = nanoseconds::max();

nanoseconds later(nanoseconds moment, nanoseconds duration) {
    if (duration <= nanoseconds::zero()) {
        return moment;
    }
    return duration < kNever - moment ? moment + duration : kNever;
}

// Thread identifiers are used again once a thread has ended; these numbers are not.
std::uint64_t threadNumber() {
    static std::atomic<std::uint64_t> last = 0;
    static const thread_local std::uint64_t number = ++last;
    return number;
}

// Where a block was posted: a queue, or the run loop of a thread.
struct Destination {
    const bool oneAtATime = false;
    const std::optional<std::uint64_t> thread;

    // The rest is guarded by the core's mutex.
    bool running = false; // a block of a serial queue
    int ports = 0;        // of a run loop
};

struct Place {
    nanoseconds due;
    std::uint64_t sequence;
    friend bool operator<(const Place& left, const Place& right) {
        return std::tie(left.due, left.sequence) < std::tie(right.due, right.sequence);
    }
};

struct Item {
    std::shared_ptr<Destination> destination;
    std::function<void()> block;
};

// Blocks must not throw: one that does ends the process, as it does on a thread of its own.
void call(const std::function<void()>& block) noexcept {
    block();
}

} // namespace

struct VirtualTime::Core {
    explicit Core(OutstandingWork work) : outstandingWork(work) {}

    void post(const std::shared_ptr<Destination>& destination, nanoseconds delay,
              std::function<void()> block);

    // One wait of the calling thread, until `deadline` or until `isOver` (called with the mutex held) is
    // true.
    //  isSleep  whether nothing but time ends it
    //  loop    whose performed blocks run meanwhile, or null
    //  result  the last answer of isOver
    bool wait(Lock& lock, bool isSleep, nanoseconds deadline, const Destination* loop,
              const std::function<bool()>& isOver);

    // Runs what is due and was posted before the call, as long as isOver is false.
    //  result  true when a performed block was among it
    bool runDue(Lock& lock, const Destination* loop, const std::function<bool()>& isOver);

    void run(Lock& lock, Item item);

    // The first item that may run in this wait: due at any time, in the order of their places.
    std::map<Place, Item>::iterator firstRunnable(const Destination* loop);

    bool hasPerformedBlocks(std::uint64_t thread) const;

    const OutstandingWork outstandingWork;

    mutable std::mutex mutex;
    std::condition_variable changed;
    bool isClosed = false;
    nanoseconds now = nanoseconds::zero();
    std::uint64_t nextSequence = 0;
    std::map<Place, Item> items;
    std::multiset<nanoseconds> deadlines;       // of the threads that really wait just now
    std::map<std::uint64_t, int> blocksOnStack; // by thread
    int busyThreads = 0;                        // in a block, and not in a wait inside it
    std::int64_t outstanding = 0;               // the sum of all groups' counts
    std::map<std::uint64_t, std::shared_ptr<Loop>> loops;
};

void VirtualTime::Core::post(const std::shared_ptr<Destination>& destination, nanoseconds delay,
                             std::function<void()> block) {
    const std::lock_guard lock(mutex);
    if (isClosed) {
        return;
    }
    items.emplace(Place{later(now, delay), nextSequence++}, Item{destination, std::move(block)});
    changed.notify_all();
}

std::map<Place, Item>::iterator VirtualTime::Core::firstRunnable(const Destination* loop) {
    return std::find_if(items.begin(), items.end(), [loop](const auto& entry) {
        const Destination& destination = *entry.second.destination;
        return destination.thread ? &destination == loop : !destination.running;
    });
}

bool VirtualTime::Core::hasPerformedBlocks(std::uint64_t thread) const {
    return std::any_of(items.begin(), items.end(),
                       [thread](const auto& entry) { return entry.second.destination->thread == thread; });
}

void VirtualTime::Core::run(Lock& lock, Item item) {
    const std::uint64_t thread = threadNumber();
    item.destination->running = item.destination->oneAtATime;
    ++blocksOnStack[thread];
    ++busyThreads;
    lock.unlock();
    call(item.block);
    item.block = nullptr; // without the mutex: what the block holds may be handles of this object
    lock.lock();
    --busyThreads;
    if (--blocksOnStack[thread] == 0) {
        blocksOnStack.erase(thread);
    }
    item.destination->running = false;
    changed.notify_all();
}

bool VirtualTime::Core::runDue(Lock& lock, const Destination* loop, const std::function<bool()>& isOver) {
    const std::uint64_t end = nextSequence;
    bool ranPerformedBlock = false;
    while (!isOver()) {
        const auto next = firstRunnable(loop);
        if (next == items.end() || next->first.due > now || next->first.sequence >= end) {
            break;
        }
        Item item = std::move(next->second);
        items.erase(next);
        ranPerformedBlock |= item.destination->thread.has_value();
        run(lock, std::move(item));
    }
    return ranPerformedBlock;
}

bool VirtualTime::Core::wait(Lock& lock, bool isSleep, nanoseconds deadline, const Destination* loop,
                             const std::function<bool()>& isOver) {
    const std::uint64_t thread = threadNumber();
    const bool isInBlock = blocksOnStack.contains(thread);
    bool ranPerformedBlock = false;
    busyThreads -= isInBlock;
    changed.notify_all();

    while (!isClosed) {
        // A run loop without a source still runs everything that is due.
        ranPerformedBlock |= loop ? runDue(lock, loop, [] { return false; }) : runDue(lock, loop, isOver);
        if (isOver() || now >= deadline) {
            break;
        }
        const auto next = firstRunnable(loop);
        if (next != items.end() && next->first.due <= now) {
            continue;
        }

        const bool standsStill =
            outstandingWork == OutstandingWork::OnRealThreads && !isSleep && outstanding > 0;
        // The caller has something new to look at, and no deadline will come to give it the turn.
        if (standsStill && (loop ? ranPerformedBlock : hasPerformedBlocks(thread))) {
            break;
        }
        const bool othersAreBehind = busyThreads > 0 || (!deadlines.empty() && *deadlines.begin() <= now);
        nanoseconds target = deadline;
        if (!deadlines.empty()) {
            target = std::min(target, *deadlines.begin());
        }
        if (next != items.end()) {
            target = std::min(target, next->first.due);
        }
        if (standsStill || othersAreBehind || target == kNever) {
            const auto ownDeadline = deadlines.insert(deadline);
            changed.wait(lock);
            deadlines.erase(ownDeadline);
            continue;
        }
        now = target;
        changed.notify_all();
    }

    busyThreads += isInBlock;
    changed.notify_all();
    return isOver();
}

class VirtualTime::Port final : public platform::RunLoopPort {
  public:
    Port(std::shared_ptr<Core> core, std::shared_ptr<Destination> loop)
        : _core(std::move(core)),
          _loop(std::move(loop)) {
        const std::lock_guard lock(_core->mutex);
        ++_loop->ports;
    }

    ~Port() override {
        const std::lock_guard lock(_core->mutex);
        --_loop->ports;
        _core->changed.notify_all();
    }

    Port(const Port&) = delete;
    Port& operator=(const Port&) = delete;

  private:
    const std::shared_ptr<Core> _core;
    const std::shared_ptr<Destination> _loop;
};

class VirtualTime::Loop final : public platform::RunLoop {
  public:
    explicit Loop(std::shared_ptr<Core> core)
        : _core(std::move(core)),
          _destination(new Destination{false, threadNumber()}) {}

    void run(nanoseconds duration) override {
        Lock lock(_core->mutex);
        _core->wait(lock, false, later(_core->now, duration), _destination.get(), [this] {
            return _destination->ports == 0 && !_core->hasPerformedBlocks(*_destination->thread);
        });
    }

    void perform(std::function<void()> block) override {
        _core->post(_destination, nanoseconds::zero(), std::move(block));
    }

    std::unique_ptr<platform::RunLoopPort> attachPort() override {
        return std::make_unique<Port>(_core, _destination);
    }

  private:
    const std::shared_ptr<Core> _core;
    const std::shared_ptr<Destination> _destination;
};

class VirtualTime::Queue final : public platform::DispatchQueue {
  public:
    Queue(std::shared_ptr<Core> core, bool isSerial)
        : _core(std::move(core)),
          _destination(new Destination{isSerial, std::nullopt}) {}

    void async(std::function<void()> block) override {
        _core->post(_destination, nanoseconds::zero(), std::move(block));
    }

    void asyncAfter(nanoseconds delay, std::function<void()> block) override {
        _core->post(_destination, delay, std::move(block));
    }

  private:
    const std::shared_ptr<Core> _core;
    const std::shared_ptr<Destination> _destination;
};

class VirtualTime::Group final : public platform::WorkGroup {
  public:
    explicit Group(std::shared_ptr<Core> core) : _core(std::move(core)) {}

    ~Group() override {
        const std::lock_guard lock(_core->mutex);
        _core->outstanding -= _count;
        _core->changed.notify_all();
    }

    Group(const Group&) = delete;
    Group& operator=(const Group&) = delete;

    void enter() override {
        const std::lock_guard lock(_core->mutex);
        ++_count;
        ++_core->outstanding;
    }

    void leave() override {
        const std::lock_guard lock(_core->mutex);
        if (_count == 0) {
            return;
        }
        --_count;
        --_core->outstanding;
        _core->changed.notify_all();
    }

    bool wait(nanoseconds timeOut) override {
        Lock lock(_core->mutex);
        return _core->wait(lock, false, later(_core->now, timeOut), nullptr, [this] { return _count == 0; });
    }

  private:
    const std::shared_ptr<Core> _core;
    std::int64_t _count = 0;
};

VirtualTime::VirtualTime(OutstandingWork outstandingWork)
    : _core(std::make_shared<Core>(outstandingWork)),
      _global(std::make_unique<Queue>(_core, false)) {}

VirtualTime::~VirtualTime() {
    std::map<Place, Item> dropped;
    std::map<std::uint64_t, std::shared_ptr<Loop>> loops;
    {
        const std::lock_guard lock(_core->mutex);
        _core->isClosed = true;
        dropped.swap(_core->items);
        loops.swap(_core->loops);
    }
    // What the blocks hold may be handles of this object: it is released without the mutex.
}

nanoseconds VirtualTime::now() {
    const std::lock_guard lock(_core->mutex);
    return _core->now;
}

void VirtualTime::sleep(nanoseconds duration) {
    Lock lock(_core->mutex);
    _core->wait(lock, true, later(_core->now, duration), nullptr, [] { return false; });
}

std::shared_ptr<platform::RunLoop> VirtualTime::current() {
    const std::lock_guard lock(_core->mutex);
    std::shared_ptr<Loop>& loop = _core->loops[threadNumber()];
    if (!loop) {
        loop = std::make_shared<Loop>(_core);
    }
    return loop;
}

std::shared_ptr<platform::DispatchQueue> VirtualTime::createSerial(const std::string& /*name*/) {
    return std::make_shared<Queue>(_core, true);
}

platform::DispatchQueue& VirtualTime::global() {
    return *_global;
}

std::shared_ptr<platform::WorkGroup> VirtualTime::createGroup() {
    return std::make_shared<Group>(_core);
}

} // namespace welcomer::simulated
