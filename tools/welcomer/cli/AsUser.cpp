#include "tools/welcomer/cli/AsUser.h"

#include "backends/posix/BecomeUser.h"
#include "backends/posix/RootFolder.h"
#include "tools/welcomer/cli/AskedDirectory.h"
#include "tools/welcomer/terminal/Failure.h"

#include <array>
#include <cerrno>
#include <csignal>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <system_error>
#include <unistd.h>

namespace welcomer::tool {

namespace {

constexpr int kSignalStatus = 128; // of a process that a signal has ended, as shells have it

CommandFailure systemFailure(const std::string& what) {
    return CommandFailure(what + ": " + std::generic_category().message(errno));
}

// Programs that let nobody in, wherever they are.
bool isLoginShell(const std::string& shell) {
    const std::string name = shell.substr(shell.rfind('/') + 1);
    return name != "nologin" && name != "false";
}

// In the new process.
void become(const posix::PasswordEntry& user, const std::string& root, pid_t parent) {
    if (const platform::Outcome outcome = posix::becomeUser(user); !outcome) {
        throw CommandFailure("--user: " + outcome.error.message);
    }
    // Whoever ends the one ends the other. It is told after the ids have changed: a change takes it back.
    if (::prctl(PR_SET_PDEATHSIG, SIGTERM, 0, 0, 0) != 0 || ::getppid() != parent) {
        throw CommandFailure("--user: the process that asks for it has ended");
    }
    // Asked as the user: a home on a server may be hidden from root.
    const posix::RootFolder folder(root);
    if (!folder.open(user.home, O_PATH | O_DIRECTORY | O_CLOEXEC)) {
        throw systemFailure("--user: the user " + user.name + " has no home folder " +
                            folder.shown(user.home));
    }
}

// What is typed at the terminal is the user's process's business.
void ignoreTheTerminalsSignals() {
    for (const int signal : {SIGINT, SIGQUIT}) {
        std::signal(signal, SIG_IGN);
    }
}

// Waits for the process, and ends as it did.
int statusOf(pid_t process) {
    int status = 0;
    while (::waitpid(process, &status, 0) < 0) {
        if (errno != EINTR) {
            throw systemFailure("--user: the user's process is lost");
        }
    }
    if (WIFEXITED(status)) {
        return WEXITSTATUS(status);
    }
    const int signal = WTERMSIG(status);
    std::signal(signal, SIG_DFL);
    std::raise(signal);
    return kSignalStatus + signal;
}

} // namespace

posix::PasswordEntry userToActFor(const std::string& name) {
    if (::geteuid() != 0) {
        throw CommandFailure("--user: only root can act for another user");
    }
    int error = 0;
    const auto user = posix::passwordEntryNamed(name, error);
    if (!user) {
        throw CommandFailure("--user: there is no user " + name +
                             (error == 0 ? "" : ": " + std::generic_category().message(error)));
    }
    if (user->userID == 0) {
        throw UsageError("--user: " + name + " is root, who needs no such option");
    }
    if (!isLoginShell(user->shell)) {
        throw CommandFailure("--user: the user " + name + " cannot log in: the shell is " + user->shell);
    }
    if (!user->home.starts_with('/')) {
        throw CommandFailure("--user: the user " + name + " has no home folder");
    }
    return *user;
}

int runAsUser(const posix::PasswordEntry& user, const std::string& root, const PlatformFactory& buildPlatform,
              const std::function<int(platform::SignInDirectory&)>& command) {
    std::array<int, 2> sockets = {-1, -1};
    if (::socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, sockets.data()) != 0) {
        throw systemFailure("--user");
    }
    posix::FileDescriptor answering(sockets[0]);
    posix::FileDescriptor asking(sockets[1]);
    const pid_t self = ::getpid();
    const pid_t process = ::fork();
    if (process < 0) {
        throw systemFailure("--user");
    }
    if (process == 0) {
        answering = posix::FileDescriptor();
        become(user, root, self);
        AskedDirectory directory(std::move(asking));
        return command(directory);
    }
    asking = posix::FileDescriptor();
    ignoreTheTerminalsSignals();
    answerQuestions(answering.get(), buildPlatform({.root = root}, TimeKind::Real)->signInDirectory());
    return statusOf(process);
}

} // namespace welcomer::tool
