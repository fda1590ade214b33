// The system log, on the socket that syslog(3) writes to.

#pragma once

#include "backends/posix/SystemLogConnection.h"
#include "platform/SystemLog.h"

#include <cstddef>

namespace welcomer::local {

// The longest message that is written whole, in bytes. A record goes as one datagram, and one that
// the socket refuses is lost without a word. The kernel takes what the socket's send buffer holds, which is
// 212,960 bytes unless the machine's owner has set net.core.wmem_default; up to 64 KiB it also needs no large
// piece of memory in one. What a daemon then keeps is its own matter: rsyslogd cuts after 8 KiB.
inline constexpr std::size_t kMaximumLogMessage = std::size_t{64} * 1024;

// The records carry the program's name. A NUL in a message is written as "\0", since a record's text ends
// there. A message that is too long is cut and ends in "…". A record that the daemon does not take within a second
// is lost.
class LocalSystemLog final : public platform::SystemLog {
  public:
    void write(int priority, const std::string& message) override;

  private:
    posix::SystemLogConnection _connection;
};

} // namespace welcomer::local
