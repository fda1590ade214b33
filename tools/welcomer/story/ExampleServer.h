// The account server of the story: the installed program, in a process of its own, with the story's folder as its root.

#pragma once

#include "backends/posix/FileDescriptor.h"
#include "tools/welcomer/terminal/InterruptionGuard.h"

#include <filesystem>
#include <string>
#include <sys/types.h>
#include <vector>

namespace welcomer::tool {

// Finds the account server's program beside the running one. Throws CommandFailure where it is not installed.
std::filesystem::path findAccountServer();

// Serves for as long as it lives. Main thread, no other thread running.
class ExampleServer {
  public:
    // Starts the program, and returns when it can be asked. Throws CommandFailure with what it says where it cannot,
    // and Interrupted.
    //  program  as findAccountServer() finds it
    //  root     below which it has its directory of users and its socket
    ExampleServer(const std::filesystem::path& program, const std::filesystem::path& root,
                  InterruptionGuard& guard);

    // Ends it, once what is under way has its answer.
    ~ExampleServer();
    ExampleServer(const ExampleServer&) = delete;
    ExampleServer& operator=(const ExampleServer&) = delete;

    // Where it is asked, as settings have it.
    const std::string& address() const { return _address; }

    // The lines of its log since the last time.
    std::vector<std::string> newLines();

  private:
    bool _read();
    void _end() const;

    const std::string _address;
    posix::FileDescriptor _output;
    pid_t _process = -1;
    std::string _text; // of its output, what nobody has had yet
};

} // namespace welcomer::tool
