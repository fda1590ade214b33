#include "tools/resolver-sync/Forwarder.h"

#include "backends/posix/FileContent.h"
#include "backends/posix/FileDescriptor.h"
#include "platform/Platform.h"
#include "tools/shared/ForwarderProgram.h"

#include <algorithm>
#include <arpa/inet.h>
#include <array>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <poll.h>
#include <random>
#include <spawn.h>
#include <sys/mman.h>
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

constexpr auto kLongestStart = 20s; // while the machine starts up, too; one that ends is not waited for

// The name that it answers for itself, with its secret.
constexpr const char* kOwnName = "forwarder.welcomer.invalid";
// The question for its text: one label after the other, the end of the name, the type TXT and the class IN.
constexpr std::string_view kQuestion("\11forwarder\10welcomer\7invalid\0\0\20\0\1", 32);
constexpr std::string_view kHead("\1\0\0\1\0\0\0\0\0\0", 10); // recursion is wished; one question

std::string randomText(std::size_t bytes) {
    static constexpr std::string_view kDigits = "0123456789abcdef";
    std::random_device random;
    std::string text;
    for (std::size_t count = 0; count < 2 * bytes; ++count) {
        text += kDigits[random() % kDigits.size()];
    }
    return text;
}

// Asks once; whether the secret is what comes back within the time. Another one may answer too.
bool answers(int socket, const std::string& secret, std::chrono::milliseconds time) {
    const std::string number = randomText(1);
    const std::string query = number + std::string(kHead) + std::string(kQuestion);
    if (::send(socket, query.data(), query.size(), 0) < 0) {
        return false;
    }
    const auto end = std::chrono::steady_clock::now() + time;
    while (true) {
        const auto left =
            std::chrono::ceil<std::chrono::milliseconds>(end - std::chrono::steady_clock::now());
        pollfd waiting{socket, POLLIN, 0};
        std::array<char, 512> bytes{};
        if (left.count() <= 0 || ::poll(&waiting, 1, static_cast<int>(left.count())) != 1) {
            return false;
        }
        const ssize_t size = ::recv(socket, bytes.data(), bytes.size(), 0);
        const std::string_view answer(bytes.data(), static_cast<std::size_t>(std::max(size, ssize_t{0})));
        if (size < 0 || (answer.starts_with(number) && answer.find(secret) != std::string_view::npos)) {
            return size >= 0;
        }
    }
}

// A file that a child reads as its input, with this content; none when that failed, and errno says why. The other users
// could read a child's arguments.
posix::FileDescriptor inputWith(const std::string& content) {
    posix::FileDescriptor file(::memfd_create("configuration", MFD_CLOEXEC));
    if (file && (posix::writeAll(file.get(), content) != 0 || ::lseek(file.get(), 0, SEEK_SET) != 0)) {
        return posix::FileDescriptor();
    }
    return file;
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
    _secret = randomText(16);
    const posix::FileDescriptor input =
        inputWith(std::string("txt-record=").append(kOwnName).append(",").append(_secret).append("\n"));
    if (!input) {
        return failure(errno, std::string("failed to start ") + kForwarderProgram);
    }
    std::vector<std::string> arguments{kForwarderProgram,
                                       "--keep-in-foreground",
                                       "--conf-file=-",
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
    posix_spawn_file_actions_t actions{};
    ::posix_spawn_file_actions_init(&actions);
    ::posix_spawn_file_actions_adddup2(&actions, input.get(), STDIN_FILENO);
    const int number =
        ::posix_spawn(&_process, kForwarderProgram, &actions, &attributes, pointers.data(), environ);
    ::posix_spawn_file_actions_destroy(&actions);
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
        const auto end = std::chrono::steady_clock::now() + kLongestStart;
        while (!(ready = answers(socket, _secret, 200ms)) && std::chrono::steady_clock::now() < end) {
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
