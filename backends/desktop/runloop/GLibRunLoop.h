// The main thread's run loop on GLib's default main context.

#pragma once

#include "platform/RunLoop.h"

#include <atomic>
#include <cstdint>
#include <deque>
#include <mutex>

namespace welcomer::desktop {

// GLib cannot tell whether anything is attached to a context (signal subscriptions and tasks do not show):
// this loop always counts as having a source, and runs for the whole duration. Blocks are idle sources,
// because what GLib offers for running a function in a context may run it on the posting thread.
//
// It sleeps until its deadline unless something is ready. A source that blocks delays what comes after it.
class GLibRunLoop final : public platform::RunLoop {
  public:
    void run(std::chrono::nanoseconds duration) noexcept override;
    void perform(std::function<void()> block) noexcept override;
    std::unique_ptr<platform::RunLoopPort> attachPort() noexcept override;
    bool hasForeignSources() const noexcept override { return true; }

    // Runs the block that has waited longest.
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
    std::shared_ptr<platform::RunLoop> current() noexcept override;
};

} // namespace welcomer::desktop
