// Dispatch queues that can be waited for.

#pragma once

#include "platform/DispatchQueue.h"

#include <memory>

namespace welcomer::tool {

// Hands everything on to other queues, and knows whether the global queue still has a block to run.
class PendingBlocks final : public platform::DispatchQueues {
  public:
    // Borrows the queues, which must outlive this and its blocks.
    explicit PendingBlocks(platform::DispatchQueues& queues);

    std::shared_ptr<platform::DispatchQueue> createSerial(const std::string& name) override {
        return _queues.createSerial(name);
    }
    platform::DispatchQueue& global() override { return _global; }
    std::shared_ptr<platform::WorkGroup> createGroup() override { return _queues.createGroup(); }

    // Blocks until every block that the global queue was given has run, however long its delay. Any thread
    // but the queue's own.
    void wait();

  private:
    class CountedQueue final : public platform::DispatchQueue {
      public:
        CountedQueue(platform::DispatchQueue& queue, std::shared_ptr<platform::WorkGroup> group)
            : _queue(queue),
              _group(std::move(group)) {}
        void async(std::function<void()> block) override { _queue.async(_counted(std::move(block))); }
        void asyncAfter(std::chrono::nanoseconds delay, std::function<void()> block) override {
            _queue.asyncAfter(delay, _counted(std::move(block)));
        }

      private:
        std::function<void()> _counted(std::function<void()> block);

        platform::DispatchQueue& _queue;
        const std::shared_ptr<platform::WorkGroup> _group;
    };

    platform::DispatchQueues& _queues;
    const std::shared_ptr<platform::WorkGroup> _group;
    CountedQueue _global;
};

} // namespace welcomer::tool
