#include "tools/account-server/ListeningSockets.h"

#include <arpa/inet.h>
#include <array>
#include <cerrno>
#include <cstdlib>
#include <memory>
#include <netinet/in.h>
#include <stdexcept>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <system_error>
#include <systemd/sd-daemon.h>
#include <unistd.h>

namespace welcomer::server {

namespace {

constexpr char kMetricsName[] = "metrics";
constexpr char kClearName[] = "clear";
constexpr char kTlsName[] = "tls";

// Has the address and whether it is this machine's own be known.
void describe(ListeningSocket& socket) {
    sockaddr_storage address{};
    socklen_t length = sizeof address;
    ::getsockname(socket.socket.get(), reinterpret_cast<sockaddr*>(&address), &length);
    std::array<char, INET6_ADDRSTRLEN> text{};
    if (address.ss_family == AF_INET) {
        const auto& four = reinterpret_cast<const sockaddr_in&>(address);
        ::inet_ntop(AF_INET, &four.sin_addr, text.data(), text.size());
        socket.shown = std::string(text.data()) + ":" + std::to_string(ntohs(four.sin_port));
        socket.isLocal = (ntohl(four.sin_addr.s_addr) >> 24U) == IN_LOOPBACKNET;
    } else if (address.ss_family == AF_INET6) {
        const auto& six = reinterpret_cast<const sockaddr_in6&>(address);
        ::inet_ntop(AF_INET6, &six.sin6_addr, text.data(), text.size());
        socket.shown = "[" + std::string(text.data()) + "]:" + std::to_string(ntohs(six.sin6_port));
        socket.isLocal = IN6_IS_ADDR_LOOPBACK(&six.sin6_addr);
    } else {
        socket.shown = reinterpret_cast<const sockaddr_un&>(address).sun_path;
        socket.isUnix = socket.isLocal = address.ss_family == AF_UNIX;
    }
}

} // namespace

std::vector<ListeningSocket> takeListeningSockets() {
    char** names = nullptr;
    const int count = sd_listen_fds_with_names(1, &names);
    std::vector<ListeningSocket> sockets;
    for (int i = 0; i < count; ++i) {
        sockets.push_back({posix::FileDescriptor(SD_LISTEN_FDS_START + i), names[i], {}, false, false});
        std::free(names[i]);
        describe(sockets.back());
    }
    std::free(names);
    if (sockets.empty()) {
        throw std::runtime_error("no socket was handed over: start welcomer-account-server.socket");
    }
    for (const ListeningSocket& socket : sockets) {
        if (sd_is_socket(socket.socket.get(), AF_UNSPEC, SOCK_STREAM, 1) <= 0) {
            throw std::runtime_error("the socket \"" + socket.name +
                                     "\" is none that connections come in on");
        }
    }
    return sockets;
}

std::vector<ListeningSocket> openListeningSocket(const std::string& path) {
    const auto failed = [&path](int error) {
        return std::runtime_error(path + ": " + std::generic_category().message(error));
    };
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    if (path.size() >= sizeof address.sun_path) {
        throw failed(ENAMETOOLONG);
    }
    path.copy(address.sun_path, path.size());
    std::vector<ListeningSocket> sockets(1);
    sockets[0].socket = posix::FileDescriptor(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
    ::unlink(path.c_str());
    const mode_t mask = ::umask(S_IXUSR | S_IRWXG | S_IRWXO);
    const int bound =
        ::bind(sockets[0].socket.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address);
    ::umask(mask);
    if (bound != 0 || ::listen(sockets[0].socket.get(), SOMAXCONN) != 0) {
        throw failed(errno);
    }
    describe(sockets[0]);
    return sockets;
}

ListeningSocket::Use useOf(const ListeningSocket& socket, bool hasCertificate) {
    using Use = ListeningSocket::Use;
    if (socket.name == kMetricsName) {
        return Use::Metrics;
    }
    // A front on this machine has the encryption behind it; nobody listens in on a Unix socket.
    if (socket.isUnix ||
        (socket.isLocal && (socket.name == kClearName || (!hasCertificate && socket.name != kTlsName)))) {
        return Use::Clear;
    }
    if (socket.name == kClearName) {
        throw std::runtime_error(socket.shown +
                                 " is not this machine's alone: passwords would come in the clear");
    }
    if (!hasCertificate) {
        throw std::runtime_error(socket.shown + " needs a certificate: Certificate and Key are not set");
    }
    return Use::Tls;
}

} // namespace welcomer::server
