// Connecting to a directory within a limit, which libldap keeps neither for TLS nor on every way to a connection.

#pragma once

#include "backends/posix/FileDescriptor.h"

#include <chrono>
#include <string>
#include <thread>

namespace welcomer::server {

// Connects to the first address of a host that answers. What is read from the connection later waits no longer
// than the limit either.
//  host    a name, an address, or the path of a Unix socket
//  result  none when nobody answers in time; errno says why
// Any thread.
posix::FileDescriptor connectWithin(const std::string& host, int port, std::chrono::seconds limit);

// Ends a connection that is still being set up when the limit is over: whoever reads from it learns that it has
// ended. The socket has to outlive this.
class BrokenOffAfter {
  public:
    BrokenOffAfter(int socket, std::chrono::seconds limit);

  private:
    std::jthread _watch;
};

} // namespace welcomer::server
