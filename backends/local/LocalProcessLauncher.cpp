#include "backends/local/LocalProcessLauncher.h"

#include "backends/posix/SystemError.h"

#include <cerrno>
#include <csignal>
#include <fcntl.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

namespace welcomer::local {

namespace {

constexpr int kSignalStatusBase = 128; // as shells count

// Gives the program a clean start: no signal blocked or ignored.
class SpawnAttributes {
  public:
    SpawnAttributes() {
        ::posix_spawnattr_init(&_attributes);
        sigset_t signals;
        ::sigemptyset(&signals);
        ::posix_spawnattr_setsigmask(&_attributes, &signals);
        ::sigfillset(&signals);
        ::posix_spawnattr_setsigdefault(&_attributes, &signals);
        ::posix_spawnattr_setflags(&_attributes, POSIX_SPAWN_SETSIGMASK | POSIX_SPAWN_SETSIGDEF);
    }
    ~SpawnAttributes() { ::posix_spawnattr_destroy(&_attributes); }
    SpawnAttributes(const SpawnAttributes&) = delete;
    SpawnAttributes& operator=(const SpawnAttributes&) = delete;

    const posix_spawnattr_t* get() const { return &_attributes; }

  private:
    posix_spawnattr_t _attributes = {};
};

// Has the program's standard streams lead nowhere.
class NullStreams {
  public:
    NullStreams() {
        ::posix_spawn_file_actions_init(&_actions);
        ::posix_spawn_file_actions_addopen(&_actions, STDIN_FILENO, "/dev/null", O_RDWR, 0);
        ::posix_spawn_file_actions_adddup2(&_actions, STDIN_FILENO, STDOUT_FILENO);
        ::posix_spawn_file_actions_adddup2(&_actions, STDIN_FILENO, STDERR_FILENO);
    }
    ~NullStreams() { ::posix_spawn_file_actions_destroy(&_actions); }
    NullStreams(const NullStreams&) = delete;
    NullStreams& operator=(const NullStreams&) = delete;

    const posix_spawn_file_actions_t* get() const { return &_actions; }

  private:
    posix_spawn_file_actions_t _actions = {};
};

// The argument list as the system takes it; it borrows the texts, which the system does not change.
std::vector<char*> argumentList(const std::string& program, const std::vector<std::string>& arguments) {
    std::vector<char*> list{const_cast<char*>(program.c_str())};
    for (const std::string& argument : arguments) {
        list.push_back(const_cast<char*>(argument.c_str()));
    }
    list.push_back(nullptr);
    return list;
}

} // namespace

int LocalProcessLauncher::launchAndWait(const std::string& program,
                                        const std::vector<std::string>& arguments) {
    const SpawnAttributes attributes;
    const NullStreams streams;
    pid_t process = 0;
    const int launched = ::posix_spawn(&process, program.c_str(), streams.get(), attributes.get(),
                                       argumentList(program, arguments).data(), ::environ);
    if (launched != 0) {
        throw platform::Exception(posix::systemError("cannot launch " + program, launched).message);
    }
    int status = 0;
    while (::waitpid(process, &status, 0) != process) {
        if (errno != EINTR) {
            throw platform::Exception(posix::systemError("cannot wait for " + program, errno).message);
        }
    }
    return WIFEXITED(status) ? WEXITSTATUS(status) : kSignalStatusBase + WTERMSIG(status);
}

} // namespace welcomer::local
