// Has the system calls of this test program fail, or the process end, at a chosen one.
//
// A program that links SystemCallFaults.cpp makes its own calls of fchmod, fchmodat, fstat, fsync, flock,
// ftruncate, linkat, mkdirat, open, openat, posix_fallocate, read, recvmsg, renameat, sendto, stat, unlink,
// unlinkat and write through this counter, and libraries do so with theirs of recvmsg and sendto; those that
// the C library makes within itself are not seen. One thread at a time.

#pragma once

#include <string>
#include <vector>

namespace welcomer {

class SystemCallFaults {
  public:
    // Counts from now on, and counts only.
    static void count();

    // Has the call with this number, counted from 1, fail with an error number and do nothing.
    static void failAt(int number, int error);

    // Ends the process with kCrashed instead of making the call with this number; a write is half made.
    static void crashAt(int number);

    // Ends all of that.
    //  result  the names of the calls that were counted, in their order
    static std::vector<std::string> stop();

    static constexpr int kCrashed = 77;
};

} // namespace welcomer
