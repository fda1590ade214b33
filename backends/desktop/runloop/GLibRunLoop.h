// The main thread's run loop on GLib's default main context.

#pragma once

#include "platform/RunLoop.h"

#include <cstdint>
#include <deque>
#include <functional>
#include <memory>
#include <mutex>

namespace welcomer::desktop {

// GLib cannot tell whether anything is attached to a context (signal subscriptions and tasks do not show):
// this loop always counts as having a source, and runs for the whole duration. Blocks are idle sources,
// because what GLib offers for running a function in a context may run it on the posting thread.
//
// The thread that makes the loops owns the context from then on, until the process ends: whoever else runs it
// waits for it within GLib, sources and blocks are dispatched on the owner's thread alone, and a run ends
// when its time is over. A run on any other thread only lets that time pass.
//
// It sleeps until its deadline unless something is ready. A source that blocks delays what comes after it.
class GLibRunLoop final : public platform::RunLoop {
  public:
    void run(std::chrono::nanoseconds duration) override;
    void perform(std::function<void()> block) override;
    std::unique_ptr<platform::RunLoopPort> attachPort() override;

    // Runs the block that has waited longest. GLib calls this, which is C: a block that throws ends the
    // process.
    void runNext() noexcept;

  private:
    std::mutex _mutex;
    std::deque<std::function<void()>> _pending;
    std::uint64_t _performed = 0; // blocks so far
    std::uint64_t _begun = 0;     // of them
};

// Gives every thread the main thread's loop.
class GLibRunLoops final : public platform::RunLoops {
  public:
    // Makes the calling thread, which is to be the main thread, the owner of GLib's default main context.
    //  result  null when another thread runs that context already
    static std::unique_ptr<GLibRunLoops> create();

    std::shared_ptr<platform::RunLoop> current() override;

  private:
    GLibRunLoops() = default;
};

} // namespace welcomer::desktop
