// Shows on a terminal that something takes its time.

#pragma once

#include "tools/welcomer/terminal/ProgressLine.h"

#include <condition_variable>
#include <mutex>
#include <string>
#include <thread>

namespace welcomer::tool {

// While it lives, a line on stderr says what is being waited for and for how long; not where stderr is no
// terminal, and not in the first half second.
class WaitingLine {
  public:
    //  what     for example "Signing in"
    //  visible  false keeps it from showing anything
    WaitingLine(std::string what, bool visible);
    ~WaitingLine(); // takes the line away
    WaitingLine(const WaitingLine&) = delete;
    WaitingLine& operator=(const WaitingLine&) = delete;

  private:
    void _show();

    const std::string _what;
    ProgressLine _line;
    std::mutex _mutex;
    std::condition_variable _ended;
    bool _hasEnded = false;
    std::thread _thread;
};

} // namespace welcomer::tool
