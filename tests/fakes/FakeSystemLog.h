// A system log that keeps its records.

#pragma once

#include "platform/SystemLog.h"
#include "tests/fakes/CallRecorder.h"

#include <mutex>
#include <string>
#include <vector>

namespace welcomer::fakes {

// Recorded as "SystemLog.write 115, the message". Any thread.
class FakeSystemLog final : public platform::SystemLog {
  public:
    struct Record {
        int priority;
        std::string message;
        friend bool operator==(const Record&, const Record&) = default;
    };

    explicit FakeSystemLog(CallRecorder& recorder) : _recorder(recorder) {}

    void write(int priority, const std::string& message) override;

    // What was written so far, and the messages of that alone.
    std::vector<Record> records() const;
    std::vector<std::string> lines() const;

    // Forgets what was written so far.
    void clear();

  private:
    CallRecorder& _recorder;
    mutable std::mutex _mutex;
    std::vector<Record> _records;
};

} // namespace welcomer::fakes
