// A block of a test that runs in a process of its own.

#pragma once

#include <cerrno>
#include <functional>
#include <sys/wait.h>
#include <unistd.h>

namespace welcomer {

//  block   its result is that process's exit status
//  result  the process
inline pid_t start(const std::function<int()>& block) {
    const pid_t child = ::fork();
    if (child == 0) {
        ::_exit(block());
    }
    return child;
}

// Waits for its end.
//  result  0 where the block returned that
inline int waitFor(pid_t child) {
    int status = 0;
    while (::waitpid(child, &status, 0) < 0 && errno == EINTR) {
    }
    return status;
}

} // namespace welcomer
