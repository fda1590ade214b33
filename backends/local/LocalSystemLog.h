// The system log of the C library.

#pragma once

#include "platform/SystemLog.h"

#include <cstddef>

namespace welcomer::local {

// The longest message that is written whole, in bytes. The C library sends a record as one datagram and loses
// one that the socket refuses, without a word. The kernel takes what the socket's send buffer holds, which is
// 212,960 bytes unless the machine's owner has set net.core.wmem_default; up to 64 KiB it also needs no large
// piece of memory in one. What a daemon then keeps is its own matter: rsyslogd cuts after 8 KiB.
inline constexpr std::size_t kMaximumLogMessage = std::size_t{64} * 1024;

// The log is never opened with an identity: the records carry the program's name. A NUL in a message is
// written as "\0", since the C library's text would end there. A message that is too long is cut and ends in
// "…".
class LocalSystemLog final : public platform::SystemLog {
  public:
    void write(int priority, const std::string& message) override;
};

} // namespace welcomer::local
