#include "tools/account-server/PeerOf.h"

#include "backends/posix/PasswordEntry.h"
#include "tools/account-server/Words.h"

#include <algorithm>
#include <arpa/inet.h>
#include <array>
#include <netinet/in.h>
#include <stdexcept>
#include <sys/socket.h>
#include <utility>

namespace welcomer::server {

namespace {

constexpr std::size_t kNetworkBytes = 8; // of an address of IPv6: what one customer is given at the least

std::vector<uid_t> numbersOf(const std::vector<std::string>& names) {
    std::vector<uid_t> numbers;
    for (const std::string& name : names) {
        int error = 0;
        const auto entry = posix::passwordEntryNamed(name, error);
        if (!entry) {
            throw std::runtime_error("there is no user " + name);
        }
        numbers.push_back(entry->userID);
    }
    return numbers;
}

std::string textOf(int family, const void* address) {
    std::array<char, INET6_ADDRSTRLEN> text{};
    return ::inet_ntop(family, address, text.data(), text.size()) ? text.data() : "";
}

Peer peerOf(const in_addr& address) {
    std::string text = textOf(AF_INET, &address);
    return {text, text};
}

Peer peerOf(in6_addr address) {
    if (IN6_IS_ADDR_V4MAPPED(&address)) {
        in_addr inside{};
        std::copy_n(&address.s6_addr[12], 4, reinterpret_cast<std::uint8_t*>(&inside));
        return peerOf(inside);
    }
    std::string text = textOf(AF_INET6, &address);
    std::fill(&address.s6_addr[kNetworkBytes], std::end(address.s6_addr), std::uint8_t{0});
    return {std::move(text), textOf(AF_INET6, &address) + "/64"};
}

bool isLoopback(const sockaddr_storage& address) {
    if (address.ss_family == AF_INET) {
        const auto& inside = reinterpret_cast<const sockaddr_in&>(address);
        return (ntohl(inside.sin_addr.s_addr) >> 24U) == IN_LOOPBACKNET;
    }
    return address.ss_family == AF_INET6 &&
           IN6_IS_ADDR_LOOPBACK(&reinterpret_cast<const sockaddr_in6&>(address).sin6_addr);
}

} // namespace

std::optional<Peer> peerAt(std::string_view address) {
    const std::string text(address);
    in_addr four{};
    in6_addr six{};
    if (::inet_pton(AF_INET, text.c_str(), &four) == 1) {
        return peerOf(four);
    }
    return ::inet_pton(AF_INET6, text.c_str(), &six) == 1 ? std::optional(peerOf(six)) : std::nullopt;
}

PeerOf::PeerOf(const Settings& settings)
    : _users(numbersOf(settings.users)),
      _trustsLoopback(settings.trustsLoopback) {
    std::vector<std::string> names;
    for (const std::string& front : settings.fronts) {
        if (const auto address = peerAt(front)) {
            _frontAddresses.push_back(address->shown);
        } else {
            names.push_back(front);
        }
    }
    _fronts = numbersOf(names);
}

PeerOf::Connected PeerOf::_connectedFrom(Peer peer, bool isLocal) const {
    const bool isFront = (isLocal && _trustsLoopback) || std::ranges::count(_frontAddresses, peer.shown) > 0;
    return {std::move(peer), isFront, true};
}

PeerOf::Connected PeerOf::connected(int socket) const {
    sockaddr_storage address{};
    socklen_t length = sizeof address;
    if (::getpeername(socket, reinterpret_cast<sockaddr*>(&address), &length) != 0) {
        return {};
    }
    if (address.ss_family == AF_INET) {
        return _connectedFrom(peerOf(reinterpret_cast<const sockaddr_in&>(address).sin_addr),
                              isLoopback(address));
    }
    if (address.ss_family == AF_INET6) {
        return _connectedFrom(peerOf(reinterpret_cast<const sockaddr_in6&>(address).sin6_addr),
                              isLoopback(address));
    }
    ucred credentials{};
    length = sizeof credentials;
    if (::getsockopt(socket, SOL_SOCKET, SO_PEERCRED, &credentials, &length) != 0) {
        return {};
    }
    const std::string text = "uid " + std::to_string(credentials.uid);
    const bool isFront = std::ranges::count(_fronts, credentials.uid) > 0;
    return {
        {text, text}, isFront, isFront || _users.empty() || std::ranges::count(_users, credentials.uid) > 0};
}

Peer PeerOf::sender(const Connected& connected, std::string_view forwardedFor) {
    if (!connected.isFront) {
        return connected.peer;
    }
    // The front adds at the end whom it has seen; what stands before that is anybody's word.
    const std::string_view last = withoutBlanks(forwardedFor.substr(forwardedFor.rfind(',') + 1));
    return peerAt(last).value_or(connected.peer);
}

} // namespace welcomer::server
