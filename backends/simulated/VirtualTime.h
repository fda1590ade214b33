// The clock, the run loops and the dispatch queues on simulated time.

#pragma once

#include "platform/Clock.h"
#include "platform/DispatchQueue.h"
#include "platform/RunLoop.h"

#include <chrono>
#include <memory>
#include <string>

namespace welcomer::simulated {

// Simulated time starts at 0 and moves only inside a wait: Clock::sleep, RunLoop::run or WorkGroup::wait. A
// wait first runs, on its own thread and one after the other, every block that is due; when none is left, it
// sets the time to the next moment at which something is due, or to its own end. Two minutes take
// microseconds.
//
// Order: blocks run by the time at which they are due, then in the order in which they were posted. What is
// due at the very end of a wait still runs in that wait. Performed blocks run only in RunLoop::run of their
// loop's own thread. RunLoop::run runs the queues' blocks that are due even when it returns at once for
// want of a source. A block may wait itself: the other blocks then run inside that wait, except those of its
// own serial queue. A block that waits for something that only a block below it on the stack can do waits
// in vain.
//
// The order is fixed as long as one thread waits. Posting, entering, leaving and waiting are safe on any
// thread: time never passes the end of another thread's wait, nor while another thread is running a block.
//
// Blocks that post themselves again without a delay keep a wait from ever ending. A wait without end (the
// largest durations) with nothing due really waits, for another thread to post something.
//
// Handles may outlive the object; what is posted to them is then dropped, and every wait ends at once.
class VirtualTime : public platform::Clock, public platform::RunLoops, public platform::DispatchQueues {
  public:
    // What a wait does when nothing is due although some group is not empty.
    enum class OutstandingWork {
        // Time advances: nothing but what is scheduled on this object can leave a group. For tests.
        Simulated,
        // Time stands still while any group is not empty, because real threads are doing the work:
        // WorkGroup::wait and RunLoop::run really wait, without polling, until the group is left or something
        // is posted.
        // So that nobody waits for a deadline that does not come, WorkGroup::wait times out at once when a
        // block was performed on its thread's run loop, and RunLoop::run ends once it has run such a block.
        // Clock::sleep advances as always: a job of a group can sleep.
        OnRealThreads,
    };

    explicit VirtualTime(OutstandingWork outstandingWork = OutstandingWork::Simulated);

    // Drops what has not run. No thread may be waiting.
    ~VirtualTime() override;

    VirtualTime(const VirtualTime&) = delete;
    VirtualTime& operator=(const VirtualTime&) = delete;

    std::chrono::nanoseconds now() override;
    void sleep(std::chrono::nanoseconds duration) override;

    std::shared_ptr<platform::RunLoop> current() override;

    std::shared_ptr<platform::DispatchQueue> createSerial(const std::string& name) override;
    platform::DispatchQueue& global() override;
    std::shared_ptr<platform::WorkGroup> createGroup() override;

  private:
    struct Core;
    class Loop;
    class Port;
    class Queue;
    class Group;

    const std::shared_ptr<Core> _core;
    const std::unique_ptr<platform::DispatchQueue> _global;
};

} // namespace welcomer::simulated
