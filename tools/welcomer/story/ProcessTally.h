// What else runs in this process, and below it.

#pragma once

#include <condition_variable>
#include <mutex>
#include <set>
#include <string>
#include <thread>
#include <vector>

namespace welcomer::tool {

// One thread or process, with the number and the name that the system knows it by.
struct RunningTask {
    int id = 0;
    std::string name;
};

// Counts threads from its making on, by looking every millisecond: one that lives for less may go unseen.
class ThreadTally {
  public:
    ThreadTally();
    ~ThreadTally();
    ThreadTally(const ThreadTally&) = delete;
    ThreadTally& operator=(const ThreadTally&) = delete;

    // How many threads were seen besides those that were there at first. Any thread.
    std::size_t seen() const;

    // Those of them that still run. Any thread.
    std::vector<RunningTask> running() const;

  private:
    void _watch();

    mutable std::mutex _mutex;
    std::condition_variable _ends;
    bool _isEnding = false;
    int _own = 0; // the thread that looks
    std::set<int> _atFirst;
    std::set<int> _seen;
    std::thread _watcher;
};

// The processes that this one has started and that have not ended. Any thread.
std::vector<RunningTask> childProcesses();

} // namespace welcomer::tool
