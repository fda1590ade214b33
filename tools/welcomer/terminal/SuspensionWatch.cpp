#include "tools/welcomer/terminal/SuspensionWatch.h"

#include "tools/welcomer/terminal/Failure.h"

#include <atomic>
#include <cerrno>
#include <cstdint>
#include <string>
#include <sys/eventfd.h>
#include <system_error>
#include <unistd.h>

namespace welcomer::tool {

namespace {

std::atomic<int> watchedBy{-1};
std::atomic<bool> isToStop{false};

// A handler and not a blocked signal: other threads, which libraries start, may be the ones that get it.
void note(int signal) {
    const int before = errno;
    if (signal == SIGTSTP) {
        isToStop = true;
    }
    const std::uint64_t one = 1;
    [[maybe_unused]] const ssize_t written = ::write(watchedBy, &one, sizeof one);
    errno = before;
}

int makeEvent() {
    const int event = eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK);
    if (event < 0) {
        throw CommandFailure("cannot watch for signals: " + std::generic_category().message(errno));
    }
    return event;
}

} // namespace

SuspensionWatch::SuspensionWatch() : _event(makeEvent()) {
    watchedBy = _event;
    isToStop = false;
    struct sigaction action {};
    action.sa_handler = note;
    sigaction(SIGCONT, &action, &_continueBefore);
    sigaction(SIGTSTP, nullptr, &_stopBefore);
    if (_stopBefore.sa_handler != SIG_IGN) { // a shell without jobs could not have it go on
        sigaction(SIGTSTP, &action, nullptr);
    }
}

SuspensionWatch::~SuspensionWatch() {
    sigaction(SIGTSTP, &_stopBefore, nullptr);
    sigaction(SIGCONT, &_continueBefore, nullptr);
    close(_event);
}

void SuspensionWatch::takeEffect() {
    _forgetWhatCame();
    if (isToStop.exchange(false)) {
        struct sigaction watching {};
        sigaction(SIGTSTP, &_stopBefore, &watching);
        raise(SIGTSTP); // returns when the program goes on
        sigaction(SIGTSTP, &watching, nullptr);
        _forgetWhatCame();
    }
}

void SuspensionWatch::_forgetWhatCame() const {
    std::uint64_t count = 0;
    [[maybe_unused]] const ssize_t taken = ::read(_event, &count, sizeof count);
}

} // namespace welcomer::tool
