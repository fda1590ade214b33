// Threads for what takes its time, and a queue in front of them.

#pragma once

#include <condition_variable>
#include <cstddef>
#include <deque>
#include <functional>
#include <mutex>
#include <thread>
#include <vector>

namespace welcomer::server {

class WorkerPool {
  public:
    //  threads     how many there are
    //  queueLimit  how much may wait for one
    WorkerPool(std::size_t threads, std::size_t queueLimit);

    // Waits for everything that was taken.
    ~WorkerPool();
    WorkerPool(const WorkerPool&) = delete;
    WorkerPool& operator=(const WorkerPool&) = delete;

    // Has a thread do this as soon as one is free.
    //  work    throws nothing
    //  result  false when too much waits already; the work is not done then
    // Any thread.
    bool take(std::function<void()> work);

  private:
    void _run();

    const std::size_t _queueLimit;
    std::mutex _mutex;
    std::condition_variable _changed;
    std::deque<std::function<void()>> _queue;
    std::size_t _idle = 0;
    bool _ends = false;
    std::vector<std::jthread> _threads;
};

} // namespace welcomer::server
