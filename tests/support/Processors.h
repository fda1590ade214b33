// Threads that really run at the same time: left to itself, a busy machine runs threads that wait for each
// other on one processor in turns.

#pragma once

#include <algorithm>
#include <atomic>
#include <cstddef>
#include <gtest/gtest.h>
#include <sched.h>
#include <thread>
#include <vector>

namespace welcomer {

inline std::vector<std::size_t> processorsOfThisProcess() {
    cpu_set_t set;
    CPU_ZERO(&set);
    EXPECT_EQ(::sched_getaffinity(0, sizeof set, &set), 0);
    std::vector<std::size_t> processors;
    for (std::size_t processor = 0; processor < CPU_SETSIZE; ++processor) {
        if (CPU_ISSET(processor, &set)) {
            processors.push_back(processor);
        }
    }
    return processors;
}

// Where two threads meet, any number of times.
class MeetingPoint {
  public:
    // Waits for the other thread's call.
    //  result  whether this one came last
    bool meet() {
        const std::size_t before = _arrived++;
        while (_arrived < before / 2 * 2 + 2) {
            if (_hasOneProcessor) {
                std::this_thread::yield();
            }
        }
        return before % 2 == 1;
    }

  private:
    const bool _hasOneProcessor = processorsOfThisProcess().size() == 1;
    std::atomic<std::size_t> _arrived = 0;
};

// Runs a function on two threads, each with a processor of its own where there are two, and waits for both.
// They begin together.
//  function  gets the point at which they can meet again
template <class Function>
void runOnTwoProcessors(const Function& function) {
    const std::vector<std::size_t> processors = processorsOfThisProcess();
    MeetingPoint point;
    const auto run = [&](std::size_t processor) {
        cpu_set_t set;
        CPU_ZERO(&set);
        CPU_SET(processor, &set);
        EXPECT_EQ(::sched_setaffinity(0, sizeof set, &set), 0);
        point.meet();
        function(point);
    };
    std::thread first(run, processors.front());
    std::thread second(run, processors.back());
    first.join();
    second.join();
}

} // namespace welcomer
