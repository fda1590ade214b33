#include "tools/resolver-sync/Forwarder.h"

#include "platform/Platform.h"
#include "tools/shared/ForwarderProgram.h"

#include <arpa/inet.h>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <poll.h>
#include <spawn.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <system_error>
#include <thread>
#include <unistd.h>
#include <vector>

namespace welcomer::resolver {

namespace {

using namespace std::chrono_literals;

platform::Outcome failure(int number, const std::string& what) {
    return platform::Outcome::failure({number, what + ": " + std::generic_category().message(number)});
}

// A query that it refuses itself, since it is about none of the domains.
constexpr std::string_view kQuery("\x77\x01\0\0\0\1\0\0\0\0\0\0\7invalid\0\0\1\0\1", 25);

// Asks once; whether anything answers within the time.
bool answers(int socket, std::chrono::milliseconds time) {
    if (::send(socket, kQuery.data(), kQuery.size(), 0) < 0) {
        return false;
    }
    pollfd waiting{socket, POLLIN, 0};
    char answer[512];
    return ::poll(&waiting, 1, static_cast<int>(time.count())) == 1 &&
           ::recv(socket, answer, sizeof answer, 0) > 0;
}

} // namespace

std::string serverLines(const Overrides& overrides) {
    std::string lines;
    for (const auto& [domain, nameservers] : overrides) {
        for (const Nameserver& nameserver : nameservers) {
            lines.append("server=/").append(domain).append("/").append(nameserver.address).append("#");
            lines.append(std::to_string(nameserver.port)).append("\n");
        }
    }
    return lines;
}

Forwarder::Forwarder(std::string folder) : _folder(std::move(folder)), _serversFile(_folder + "/servers") {}

Forwarder::~Forwarder() {
    stop();
}

platform::Outcome Forwarder::_writeServers(const Overrides& overrides) const {
    // It reads the file again as a user of its own.
    if (::mkdir(_folder.c_str(), 0755) != 0 && errno != EEXIST) {
        return failure(errno, "failed to create " + _folder);
    }
    platform::Outcome written =
        platform::current().fileSystem.writeText(_serversFile, serverLines(overrides));
    if (!written) {
        written.error.message = "failed to write " + _serversFile + ": " + written.error.message;
    }
    return written;
}

platform::Outcome Forwarder::_start() {
    std::vector<std::string> arguments{kForwarderProgram,
                                       "--keep-in-foreground",
                                       "--conf-file=/dev/null",
                                       "--pid-file=",
                                       "--log-facility=-",
                                       "--no-resolv",
                                       "--no-hosts",
                                       "--cache-size=0",
                                       "--bind-interfaces",
                                       std::string("--listen-address=") + kAddress,
                                       "--port=" + std::to_string(kPort),
                                       "--servers-file=" + _serversFile};
    std::vector<char*> pointers;
    pointers.reserve(arguments.size() + 1);
    for (std::string& argument : arguments) {
        pointers.push_back(argument.data());
    }
    pointers.push_back(nullptr);
    // This program handles its signals in its event loop, which is nothing that a child should inherit.
    posix_spawnattr_t attributes{};
    ::posix_spawnattr_init(&attributes);
    sigset_t none;
    ::sigemptyset(&none);
    ::posix_spawnattr_setflags(&attributes, POSIX_SPAWN_SETSIGMASK);
    ::posix_spawnattr_setsigmask(&attributes, &none);
    const int number =
        ::posix_spawn(&_process, kForwarderProgram, nullptr, &attributes, pointers.data(), environ);
    ::posix_spawnattr_destroy(&attributes);
    if (number != 0) {
        _process = 0;
        return failure(number, std::string("failed to start ") + kForwarderProgram);
    }
    return platform::Outcome::success();
}

platform::Outcome Forwarder::serve(const Overrides& overrides) {
    if (platform::Outcome written = _writeServers(overrides); !written) {
        return written;
    }
    if (_process == 0) {
        return _start();
    }
    // It takes up the signal before any query that arrives later.
    ::kill(_process, SIGHUP);
    return platform::Outcome::success();
}

platform::Outcome Forwarder::waitUntilReady() {
    const int socket = ::socket(AF_INET, SOCK_DGRAM | SOCK_CLOEXEC, 0);
    sockaddr_in address{};
    address.sin_family = AF_INET;
    address.sin_port = htons(kPort);
    ::inet_pton(AF_INET, kAddress, &address.sin_addr);
    bool ready = false;
    if (socket >= 0 && ::connect(socket, reinterpret_cast<const sockaddr*>(&address), sizeof address) == 0) {
        const auto end = std::chrono::steady_clock::now() + 5s;
        while (!(ready = answers(socket, 200ms)) && std::chrono::steady_clock::now() < end) {
            // Where nobody listens yet, the query comes back at once.
            std::this_thread::sleep_for(1ms);
            siginfo_t ended{};
            if (::waitid(P_PID, static_cast<id_t>(_process), &ended, WEXITED | WNOHANG | WNOWAIT) != 0 ||
                ended.si_pid != 0) {
                break;
            }
        }
    }
    ::close(socket);
    return ready ? platform::Outcome::success()
                 : platform::Outcome::failure({0, std::string(kForwarderProgram) + " does not answer"});
}

void Forwarder::stop() {
    if (_process != 0) {
        ::kill(_process, SIGTERM);
        ::waitpid(_process, nullptr, 0);
        _process = 0;
    }
    ::unlink(_serversFile.c_str());
    ::rmdir(_folder.c_str());
}

} // namespace welcomer::resolver
