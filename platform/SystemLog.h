// The system log.

#pragma once

#include <string>

namespace welcomer::platform {

// What the backends' own lines are written with: facility 14, severity 3, as all of the system's.
inline constexpr int kErrorPriority = (14 << 3) | 3;

class SystemLog {
  public:
    virtual ~SystemLog() = default;

    // Writes one record, or does nothing when there is no system log to write to. Never throws.
    //  priority  facility in the upper bits, severity in the low three, as syslog(3) takes them
    //  message   UTF-8; written as it stands, never as a format
    // Any thread; concurrent records do not interleave within a line.
    virtual void write(int priority, const std::string& message) = 0;
};

} // namespace welcomer::platform
