#include "tools/launch-agents/ChildStarter.h"

#include <csignal>
#include <fcntl.h>
#include <spawn.h>
#include <system_error>
#include <unistd.h>

namespace welcomer::launch {

namespace {

// What posix_spawn is told; each of the calls can fail only for want of memory, which its result says then.
class SpawnSettings {
  public:
    explicit SpawnSettings(const std::string& home) {
        ::posix_spawn_file_actions_init(&_actions);
        ::posix_spawn_file_actions_addopen(&_actions, STDIN_FILENO, "/dev/null", O_RDONLY, 0);
        ::posix_spawn_file_actions_addopen(&_actions, STDOUT_FILENO, "/dev/null", O_WRONLY, 0);
        ::posix_spawn_file_actions_adddup2(&_actions, STDOUT_FILENO, STDERR_FILENO);
        ::posix_spawn_file_actions_addchdir_np(&_actions, home.c_str());
        ::posix_spawnattr_init(&_attributes);
        ::posix_spawnattr_setflags(&_attributes,
                                   POSIX_SPAWN_SETSID | POSIX_SPAWN_SETSIGDEF | POSIX_SPAWN_SETSIGMASK);
        sigset_t signals;
        ::sigemptyset(&signals);
        ::posix_spawnattr_setsigmask(&_attributes, &signals);
        ::sigfillset(&signals);
        ::posix_spawnattr_setsigdefault(&_attributes, &signals);
    }
    ~SpawnSettings() {
        ::posix_spawnattr_destroy(&_attributes);
        ::posix_spawn_file_actions_destroy(&_actions);
    }
    SpawnSettings(const SpawnSettings&) = delete;
    SpawnSettings& operator=(const SpawnSettings&) = delete;

    const posix_spawn_file_actions_t* actions() const { return &_actions; }
    const posix_spawnattr_t* attributes() const { return &_attributes; }

  private:
    posix_spawn_file_actions_t _actions{};
    posix_spawnattr_t _attributes{};
};

} // namespace

platform::Outcome ChildStarter::start(const LaunchAgent& agent) {
    std::vector<char*> arguments;
    for (const std::string& argument : agent.arguments) {
        arguments.push_back(const_cast<char*>(argument.c_str()));
    }
    arguments.push_back(nullptr);
    const SpawnSettings settings(_home);
    pid_t child = 0;
    const int number = ::posix_spawn(&child, agent.program.c_str(), settings.actions(), settings.attributes(),
                                     arguments.data(), environ);
    if (number != 0) {
        return platform::Outcome::failure({number, std::generic_category().message(number)});
    }
    return platform::Outcome::success();
}

} // namespace welcomer::launch
