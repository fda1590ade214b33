// Queues on threads that exist only while there is work.

#pragma once

#include "platform/DispatchQueue.h"

#include <functional>
#include <memory>
#include <string>

namespace welcomer::local {

// Threads start one after the other: posting starts one unless one is on its way already, and a thread that
// has taken a block starts the next before running it when more is ready. So a block that blocks holds up
// nobody, and many quick blocks share a few threads. A thread that finds nothing ready ends; while delayed
// blocks are pending, one stays and sleeps exactly until the earliest is due.
//
// When the system refuses another thread, what is ready runs as soon as a thread is free, and every later
// post tries again. When there is no thread at all, the posting thread itself runs what is ready before it
// returns; delayed blocks then wait for the next post or the next free thread.
//
// A block that throws ends the process.
class LocalDispatchQueues final : public platform::DispatchQueues {
  public:
    // Runs a function on a new thread.
    //  result  false when there can be no further thread now; the function is then not run
    // Must not throw. Any thread.
    using ThreadStarter = std::function<bool(std::function<void()>)>;

    // Starts no thread.
    LocalDispatchQueues();
    explicit LocalDispatchQueues(ThreadStarter startThread);

    // Waits for the blocks that are running and drops the rest, the delayed ones among it. Queues that live
    // on drop what is posted to them. Not within a block.
    ~LocalDispatchQueues() override;

    LocalDispatchQueues(const LocalDispatchQueues&) = delete;
    LocalDispatchQueues& operator=(const LocalDispatchQueues&) = delete;

    std::shared_ptr<platform::DispatchQueue> createSerial(const std::string& name) override;
    platform::DispatchQueue& global() override;
    std::shared_ptr<platform::WorkGroup> createGroup() override;

  private:
    class Pool;
    class Queue;

    const std::shared_ptr<Pool> _pool;
    const std::unique_ptr<platform::DispatchQueue> _global;
};

} // namespace welcomer::local
