// The account server as it was built, as a process on a Unix socket.

#pragma once

#include <string>
#include <sys/types.h>

namespace welcomer {

// Runs from when it is made until it ends, in mounts of its own.
class AccountServerProcess {
  public:
    //  program  the server
    //  root     what it sees as the machine: its settings below etc/, its users below var/lib/, which are there
    //  socket   where it listens; made here
    AccountServerProcess(const std::string& program, const std::string& root, const std::string& socket);
    ~AccountServerProcess();
    AccountServerProcess(const AccountServerProcess&) = delete;
    AccountServerProcess& operator=(const AccountServerProcess&) = delete;

  private:
    pid_t _process = 0;
};

} // namespace welcomer
