// Work that runs beside the calling thread: serial queues, the global concurrent queue, and groups of work.

#pragma once

#include <chrono>
#include <functional>
#include <memory>
#include <string>

namespace welcomer::platform {

// Blocks handed to a queue must not throw. A queue that is released still runs what it was given. Any thread.
class DispatchQueue {
  public:
    virtual ~DispatchQueue() = default;

    // Runs a block later, on a thread of the queue's choice. A serial queue runs its blocks one at a time, in
    // the order of the calls; every queue makes progress while any other one blocks.
    virtual void async(std::function<void()> block) = 0;

    // The same, not before the delay (in nanoseconds) has passed. Delays of nothing or less have passed at
    // once; one that no clock can reach never passes.
    virtual void asyncAfter(std::chrono::nanoseconds delay, std::function<void()> block) = 0;
};

// A counted group of asynchronous work. Any thread.
class WorkGroup {
  public:
    virtual ~WorkGroup() = default;

    // Each enter is matched by one leave; a leave without its enter does nothing.
    virtual void enter() = 0;
    virtual void leave() = 0;

    // Blocks until the group is empty or the time-out has passed.
    //  result  true when the group was empty
    virtual bool wait(std::chrono::nanoseconds timeOut) = 0;
};

// Any thread.
class DispatchQueues {
  public:
    virtual ~DispatchQueues() = default;

    // A new serial queue. The name is for people; several queues may share one.
    virtual std::shared_ptr<DispatchQueue> createSerial(const std::string& name) = 0;

    // The default-priority concurrent queue; lives as long as this object.
    virtual DispatchQueue& global() = 0;

    // A new, empty group.
    virtual std::shared_ptr<WorkGroup> createGroup() = 0;
};

} // namespace welcomer::platform
