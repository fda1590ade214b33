// The socket that the C library's system log writes to, in the test's own mount namespace.

#pragma once

#include <string>
#include <vector>

namespace welcomer {

// Enters a mount namespace and puts "/dev/log" into it. Only while the process has one thread, and once.
class SystemLogSocket {
  public:
    // One record, taken apart: "<115>Nov 20 22:06:34 program: message".
    struct Record {
        int priority;
        std::string program;
        std::string message;
    };

    static bool isPossible();

    SystemLogSocket();
    ~SystemLogSocket();
    SystemLogSocket(const SystemLogSocket&) = delete;
    SystemLogSocket& operator=(const SystemLogSocket&) = delete;

    // What was written since the last call. Does not wait: a record is there once its write has returned.
    std::vector<Record> take() const;

  private:
    int _socket = -1;
};

} // namespace welcomer
