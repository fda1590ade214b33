// A process that is killed at any of its system calls.

#pragma once

#include <gtest/gtest.h>

#include <csignal>
#include <functional>
#include <optional>
#include <sys/ptrace.h>
#include <sys/wait.h>
#include <unistd.h>

namespace welcomer {

// Runs a block in a process of its own, which is killed at one of its stops. Each system call is two of them:
// before it and after it.
//  stop    counted from 1
//  result  what the block returned, where it was over before that stop
inline std::optional<int> killAtSystemCall(const std::function<int()>& block, int stop) {
    const pid_t child = ::fork();
    if (child == 0) {
        ::ptrace(PTRACE_TRACEME, 0, nullptr, nullptr);
        ::raise(SIGSTOP);
        ::_exit(block());
    }
    int status = 0;
    EXPECT_EQ(::waitpid(child, &status, 0), child);
    EXPECT_TRUE(WIFSTOPPED(status));
    for (int count = 0; count < stop && WIFSTOPPED(status); ++count) {
        EXPECT_EQ(::ptrace(PTRACE_SYSCALL, child, nullptr, nullptr), 0);
        EXPECT_EQ(::waitpid(child, &status, 0), child);
    }
    if (WIFEXITED(status)) {
        return WEXITSTATUS(status);
    }
    EXPECT_EQ(::kill(child, SIGKILL), 0);
    EXPECT_EQ(::waitpid(child, &status, 0), child);
    return std::nullopt;
}

} // namespace welcomer
