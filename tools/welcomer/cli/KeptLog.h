// Keeps the system's log lines of one command: they say why something failed.

#pragma once

#include "platform/SystemLog.h"

#include <mutex>
#include <string>

namespace welcomer::tool {

class KeptLog : public platform::SystemLog {
  public:
    // Any thread.
    void write(int priority, const std::string& message) override;

    // From now on each line is also shown on stderr as it comes.
    void setVerbose(bool verbose) { _verbose = verbose; }

    // The last line, or "no reason was given". The system logs the reason of a failure last. Any thread.
    std::string reason() const;

    // Whether there was no line yet. Any thread.
    bool isEmpty() const;

  private:
    mutable std::mutex _mutex;
    std::string _last;
    bool _verbose = false;
};

} // namespace welcomer::tool
