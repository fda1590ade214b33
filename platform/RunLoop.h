// A thread's own event loop.

#pragma once

#include <chrono>
#include <functional>
#include <memory>

namespace welcomer::platform {

// Keeps a run loop from returning early for as long as it lives. May outlive its loop; destroyed on any
// thread.
class RunLoopPort {
  public:
    virtual ~RunLoopPort() = default;
};

class RunLoop {
  public:
    virtual ~RunLoop() = default;

    // Processes performed blocks and attached sources until the duration is over, or until nothing is
    // attached and nothing is pending; with neither at the start it returns at once. A loop to which others
    // may attach sources of their own always counts as having one. Blocks that are pending at the start are
    // run even when the duration is 0 or less. Only on the loop's own thread, also from within a block.
    virtual void run(std::chrono::nanoseconds duration) = 0;

    // Has the loop's thread run a block, in the order of the calls, and wakes the loop. Any thread. The block
    // is never run on the calling thread before this returns.
    virtual void perform(std::function<void()> block) = 0;

    // Attaches a source that never fires. Any thread.
    virtual std::unique_ptr<RunLoopPort> attachPort() = 0;
};

// Gives each thread its own loop.
class RunLoops {
  public:
    virtual ~RunLoops() = default;

    // The calling thread's loop, made on first use. Whoever keeps it may use it after its thread has ended:
    // blocks are then never run.
    virtual std::shared_ptr<RunLoop> current() = 0;
};

} // namespace welcomer::platform
