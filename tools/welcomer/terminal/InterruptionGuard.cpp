#include "tools/welcomer/terminal/InterruptionGuard.h"

#include "tools/welcomer/terminal/Failure.h"

#include <cerrno>
#include <csignal>
#include <string>
#include <sys/signalfd.h>
#include <system_error>
#include <unistd.h>
#include <utility>

namespace welcomer::tool {

namespace {

// The signals that end a program from outside, a reader that went away among them, but for those that this
// process was started to ignore.
sigset_t interruptions() {
    sigset_t signals;
    sigemptyset(&signals);
    for (const int signal : {SIGINT, SIGTERM, SIGHUP, SIGQUIT, SIGPIPE}) {
        struct sigaction action {};
        sigaction(signal, nullptr, &action);
        if (action.sa_handler != SIG_IGN) {
            sigaddset(&signals, signal);
        }
    }
    return signals;
}

} // namespace

InterruptionGuard::InterruptionGuard() {
    const sigset_t signals = interruptions();
    sigprocmask(SIG_BLOCK, &signals, nullptr);
    _descriptor = signalfd(-1, &signals, SFD_CLOEXEC);
    if (_descriptor < 0) {
        throw CommandFailure("cannot watch for signals: " + std::generic_category().message(errno));
    }
}

InterruptionGuard::~InterruptionGuard() {
    release();
}

void InterruptionGuard::release() {
    if (_descriptor >= 0) {
        ::close(std::exchange(_descriptor, -1));
        const sigset_t signals = interruptions();
        sigprocmask(SIG_UNBLOCK, &signals, nullptr);
    }
}

} // namespace welcomer::tool
