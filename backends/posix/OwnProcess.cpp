#include "backends/posix/OwnProcess.h"

#include "backends/posix/FileDescriptor.h"

#include <array>
#include <cerrno>
#include <csignal>
#include <fcntl.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

namespace welcomer::posix {

namespace {

constexpr char kSuccess = 1;

[[noreturn]] void runAndEnd(const std::function<bool()>& work, int result) {
    ::prctl(PR_SET_PDEATHSIG, SIGKILL);
    try {
        if (work()) {
            static_cast<void>(::write(result, &kSuccess, 1) == 1); // who is not told takes it for a failure
        }
    } catch (...) {
        // Nobody here could be told.
    }
    ::_exit(0);
}

} // namespace

bool succeedsInAProcessOfItsOwn(const std::function<bool()>& work) {
    std::array<int, 2> ends = {-1, -1};
    if (::pipe2(ends.data(), O_CLOEXEC) != 0) {
        return false;
    }
    const FileDescriptor reading(ends[0]);
    FileDescriptor writing(ends[1]);
    const pid_t process = ::fork();
    if (process == 0) {
        runAndEnd(work, writing.get());
    }
    writing = FileDescriptor();
    char answer = 0;
    ssize_t count = 0;
    do {
        count = process < 0 ? 0 : ::read(reading.get(), &answer, 1);
    } while (count < 0 && errno == EINTR);
    // Somebody else in this process may have waited for it already, which is as good.
    while (process > 0 && ::waitpid(process, nullptr, 0) < 0 && errno == EINTR) {
    }
    return count == 1 && answer == kSuccess;
}

} // namespace welcomer::posix
