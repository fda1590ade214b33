#include "tests/support/AccountServerProcess.h"

#include "backends/posix/FileDescriptor.h"
#include "tests/support/ListeningSocket.h"

#include <csignal>
#include <spawn.h>
#include <stdexcept>
#include <sys/wait.h>
#include <unistd.h>
#include <vector>

namespace welcomer {

namespace {

// As the service manager hands it the socket; the shell becomes the server.
constexpr char kScript[] = R"(mount --bind "$1/etc" /etc && mount --bind "$1/var/lib" /var/lib &&
    LISTEN_PID=$$ LISTEN_FDS=1 LISTEN_FDNAMES=account exec "$0")";
constexpr int kFirstHandedOver = 3;

pid_t spawn(std::vector<std::string> words, int socket) {
    std::vector<char*> arguments;
    for (std::string& word : words) {
        arguments.push_back(word.data());
    }
    arguments.push_back(nullptr);
    posix_spawn_file_actions_t actions;
    ::posix_spawn_file_actions_init(&actions);
    ::posix_spawn_file_actions_adddup2(&actions, socket, kFirstHandedOver);
    pid_t process = 0;
    const int error = ::posix_spawnp(&process, arguments[0], &actions, nullptr, arguments.data(), environ);
    ::posix_spawn_file_actions_destroy(&actions);
    if (error != 0) {
        throw std::runtime_error("cannot start " + words.front());
    }
    return process;
}

} // namespace

AccountServerProcess::AccountServerProcess(const std::string& program, const std::string& root,
                                           const std::string& socket) {
    const posix::FileDescriptor listening =
        listenOn(socket); // its end here goes: without a server nobody waits
    std::vector<std::string> words{"unshare", "--mount"};
    if (::geteuid() != 0) {
        words.emplace_back("--map-root-user");
    }
    words.insert(words.end(), {"/bin/sh", "-c", kScript, program, root});
    _process = spawn(std::move(words), listening.get());
}

AccountServerProcess::~AccountServerProcess() {
    ::kill(_process, SIGTERM);
    ::waitpid(_process, nullptr, 0);
}

} // namespace welcomer
