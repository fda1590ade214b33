// The way to the system log's socket, which holds nobody up.

#pragma once

#include "backends/posix/FileDescriptor.h"

#include <chrono>
#include <condition_variable>
#include <mutex>
#include <string_view>

namespace welcomer::posix {

// How long a record may take. The C library's syslog(3) waits for as long as the daemon does not read.
inline constexpr std::chrono::seconds kLongestLogCall{1};

// Writes records as syslog(3) does: with the local time and the program's name, as datagrams, or on a stream
// where the daemon has one. The connection is made with the first record, and made anew when the daemon was.
class SystemLogConnection {
  public:
    // Sends one record. One that the daemon does not take in time is lost, as is one without a daemon.
    //  priority  facility in the upper bits, severity in the low three
    //  message   without a NUL
    // Any thread; records do not interleave. Leaves errno as it was.
    void send(int priority, std::string_view message);

  private:
    using Deadline = std::chrono::steady_clock::time_point;
    enum class Sent { Whole, Lost, NoConnection };

    bool _beginRecord(Deadline deadline);
    void _endRecord();
    bool _open(Deadline deadline);
    Sent _send(std::string_view head, std::string_view message, Deadline deadline);
    Sent _failed(bool isTorn);
    void _close();

    // Not a mutex with a time limit, which the thread sanitizer does not know.
    std::mutex _mutex;
    std::condition_variable _isFree;
    bool _isBusy = false; // with a record, which has what follows to itself
    FileDescriptor _socket;
    bool _isStream = false;
};

} // namespace welcomer::posix
