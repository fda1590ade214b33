#include "tools/welcomer/terminal/TerminalRestorer.h"

#include <algorithm>
#include <array>
#include <csignal>

namespace welcomer::tool {

namespace {

// What the handler puts back. Only changed while no signal has it.
int restoredTerminal = -1;
termios restoredSettings{};

// The signals that end no program, or that nobody can catch, and those that stop one or have it go on, which are
// SuspensionWatch's.
constexpr std::array kHarmless{SIGKILL, SIGSTOP, SIGCHLD, SIGURG, SIGWINCH,
                               SIGCONT, SIGTSTP, SIGTTIN, SIGTTOU};

// Calls only what POSIX allows in a handler. The signal's own action then ends the program.
void restoreAndEnd(int signal) {
    tcsetattr(restoredTerminal, TCSANOW, &restoredSettings);
    struct sigaction end {};
    end.sa_handler = SIG_DFL;
    sigaction(signal, &end, nullptr);
    raise(signal);
}

// Gives the signals that would end the program this action, where they have the other one.
void replaceHandlers(void (*from)(int), void (*to)(int)) {
    for (int signal = 1; signal <= SIGRTMAX; ++signal) {
        struct sigaction action {};
        if (std::ranges::find(kHarmless, signal) != kHarmless.end() ||
            sigaction(signal, nullptr, &action) != 0 || action.sa_handler != from) {
            continue;
        }
        action.sa_handler = to;
        action.sa_flags =
            to == SIG_DFL ? 0 : SA_NODEFER; // so that it ends the program from within its handler
        sigaction(signal, &action, nullptr);
    }
}

} // namespace

TerminalRestorer::TerminalRestorer(int terminal) {
    tcgetattr(terminal, &_before);
    restoredTerminal = terminal;
    restoredSettings = _before;
    replaceHandlers(SIG_DFL, restoreAndEnd);
}

TerminalRestorer::~TerminalRestorer() {
    replaceHandlers(restoreAndEnd, SIG_DFL);
}

} // namespace welcomer::tool
