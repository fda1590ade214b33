#include "backends/local/network/KernelNetwork.h"

#include <algorithm>
#include <arpa/inet.h>
#include <cerrno>
#include <cstring>
#include <linux/if_addr.h>
#include <linux/if_link.h>
#include <linux/netlink.h>
#include <linux/rtnetlink.h>
#include <net/if.h>
#include <sys/socket.h>
#include <sys/time.h>

namespace welcomer::local {

namespace {

constexpr std::size_t kBufferSize = std::size_t{64} * 1024; // the kernel fills no more than half of it
constexpr int kMaximumListings = 10;
constexpr std::uint32_t kWithoutStatistics = 1U << 3U; // RTEXT_FILTER_SKIP_STATS
constexpr timeval kPatience{10, 0};                    // the kernel answers at once
constexpr int kInterrupted = EINTR;

ifinfomsg linkBody(int index) {
    ifinfomsg body = {};
    body.ifi_family = AF_UNSPEC;
    body.ifi_index = index;
    return body;
}

posix::NetlinkRequest addressRequest(std::uint16_t type, std::uint16_t flags,
                                     const posix::KernelAddress& address) {
    ifaddrmsg body = {};
    body.ifa_family = AF_INET;
    body.ifa_prefixlen = static_cast<unsigned char>(address.prefixLength);
    body.ifa_index = static_cast<unsigned int>(address.linkIndex);
    posix::NetlinkRequest request(type, flags, body);
    request.addAddress(IFA_LOCAL, address.address);
    request.addAddress(IFA_ADDRESS, address.address);
    return request;
}

posix::NetlinkRequest routeRequest(std::uint16_t type, std::uint16_t flags, const posix::KernelRoute& route) {
    rtmsg body = {};
    body.rtm_family = AF_INET;
    body.rtm_table = RT_TABLE_MAIN;
    const bool isAdded = type == RTM_NEWROUTE;
    body.rtm_protocol = isAdded ? RTPROT_STATIC : RTPROT_UNSPEC;
    body.rtm_scope = !isAdded ? RT_SCOPE_NOWHERE : RT_SCOPE_UNIVERSE;
    body.rtm_type = isAdded ? RTN_UNICAST : RTN_UNSPEC;
    posix::NetlinkRequest request(type, flags, body);
    request.addNumber(RTA_OIF, static_cast<std::uint32_t>(route.linkIndex));
    if (route.gateway) {
        request.addAddress(RTA_GATEWAY, *route.gateway);
    }
    if (route.metric != 0) {
        request.addNumber(RTA_PRIORITY, route.metric);
    }
    return request;
}

// The error number that an error message carries; 0 is an acknowledgement.
int errorIn(std::string_view payload) {
    std::int32_t number = 0;
    if (payload.size() < sizeof number) {
        return EPROTO;
    }
    std::memcpy(&number, payload.data(), sizeof number);
    return -number;
}

int unless(int tolerated, int error) {
    return error == tolerated ? 0 : error;
}

} // namespace

std::vector<posix::KernelLink> KernelNetwork::links() {
    posix::NetlinkRequest request(RTM_GETLINK, NLM_F_DUMP, linkBody(0));
    request.addNumber(IFLA_EXT_MASK, kWithoutStatistics);
    std::vector<posix::KernelLink> found;
    _list(
        request, [&] { found.clear(); },
        [&](std::string_view payload) {
            if (auto link = posix::readLink(payload)) {
                found.push_back(std::move(*link));
            }
        });
    std::ranges::stable_sort(found, {}, &posix::KernelLink::index);
    return found;
}

std::optional<posix::KernelLink> KernelNetwork::linkNamed(const std::string& name) {
    if (name.empty() || name.size() >= IFNAMSIZ) {
        return std::nullopt;
    }
    posix::NetlinkRequest request(RTM_GETLINK, 0, linkBody(0));
    request.addAttribute(IFLA_IFNAME, name.c_str(), name.size() + 1);
    return _oneLink(request);
}

std::optional<posix::KernelLink> KernelNetwork::linkNumbered(int index) {
    posix::NetlinkRequest request(RTM_GETLINK, 0, linkBody(index));
    return _oneLink(request);
}

std::optional<posix::KernelLink> KernelNetwork::_oneLink(posix::NetlinkRequest& request) {
    request.addNumber(IFLA_EXT_MASK, kWithoutStatistics);
    std::optional<posix::KernelLink> found;
    _ask(request, [&](std::string_view payload) { found = posix::readLink(payload); });
    return found;
}

std::vector<posix::KernelAddress> KernelNetwork::addressesOf(int linkIndex) {
    ifaddrmsg body = {};
    body.ifa_family = AF_INET;
    body.ifa_index = static_cast<unsigned int>(linkIndex); // kernels that know no filter list all
    posix::NetlinkRequest request(RTM_GETADDR, NLM_F_DUMP, body);
    std::vector<posix::KernelAddress> found;
    _list(
        request, [&] { found.clear(); },
        [&](std::string_view payload) {
            const auto address = posix::readAddress(payload);
            if (address && address->linkIndex == linkIndex) {
                found.push_back(*address);
            }
        });
    return found;
}

std::vector<posix::KernelRoute> KernelNetwork::defaultRoutes() {
    rtmsg body = {};
    body.rtm_family = AF_INET;
    body.rtm_table = RT_TABLE_MAIN;
    posix::NetlinkRequest request(RTM_GETROUTE, NLM_F_DUMP, body);
    std::vector<posix::KernelRoute> found;
    _list(
        request, [&] { found.clear(); },
        [&](std::string_view payload) {
            if (const auto route = posix::readDefaultRoute(payload)) {
                found.push_back(*route);
            }
        });
    return found;
}

int KernelNetwork::bringUp(int linkIndex) {
    ifinfomsg body = linkBody(linkIndex);
    body.ifi_flags = IFF_UP;
    body.ifi_change = IFF_UP;
    posix::NetlinkRequest request(RTM_NEWLINK, NLM_F_ACK, body);
    return _change(request);
}

int KernelNetwork::addAddress(const posix::KernelAddress& address) {
    posix::NetlinkRequest request =
        addressRequest(RTM_NEWADDR, NLM_F_ACK | NLM_F_CREATE | NLM_F_REPLACE, address);
    if (address.prefixLength > 0 && address.prefixLength < 31) {
        request.addAddress(IFA_BROADCAST, address.address | (~posix::IPv4Address{0} >> address.prefixLength));
    }
    return unless(EEXIST, _change(request));
}

int KernelNetwork::removeAddress(const posix::KernelAddress& address) {
    posix::NetlinkRequest request = addressRequest(RTM_DELADDR, NLM_F_ACK, address);
    return unless(EADDRNOTAVAIL, _change(request));
}

int KernelNetwork::addDefaultRoute(const posix::KernelRoute& route) {
    posix::NetlinkRequest request =
        routeRequest(RTM_NEWROUTE, NLM_F_ACK | NLM_F_CREATE | NLM_F_REPLACE, route);
    return _change(request);
}

int KernelNetwork::removeDefaultRoute(const posix::KernelRoute& route) {
    posix::NetlinkRequest request = routeRequest(RTM_DELROUTE, NLM_F_ACK, route);
    return unless(ESRCH, _change(request));
}

int KernelNetwork::_list(posix::NetlinkRequest& request, const std::function<void()>& begin,
                         const std::function<void(std::string_view payload)>& take) {
    int error = kInterrupted;
    for (int listing = 0; error == kInterrupted && listing < kMaximumListings; ++listing) {
        begin();
        error = _ask(request, take);
    }
    return error;
}

int KernelNetwork::_change(posix::NetlinkRequest& request) {
    return _ask(request, [](std::string_view) {});
}

int KernelNetwork::_ask(posix::NetlinkRequest& request,
                        const std::function<void(std::string_view payload)>& take) {
    if (const int error = _open()) {
        return error;
    }
    const std::string_view bytes = request.bytes(++_sequence);
    if (::send(_socket.get(), bytes.data(), bytes.size(), 0) < 0) {
        return errno;
    }
    const std::uint16_t kinds = [&] {
        nlmsghdr header = {};
        std::memcpy(&header, bytes.data(), sizeof header);
        return header.nlmsg_flags;
    }();
    const bool isListing = (kinds & NLM_F_DUMP) == NLM_F_DUMP;
    const bool isAcknowledged = (kinds & NLM_F_ACK) != 0;
    std::optional<int> result;
    bool isTorn = false;
    while (!result) {
        const ssize_t size = ::recv(_socket.get(), _buffer.data(), _buffer.size(), MSG_TRUNC);
        if (size < 0 && errno == EINTR) {
            continue;
        }
        if (size < 0 || static_cast<std::size_t>(size) > _buffer.size()) {
            const int error = size < 0 ? errno : EMSGSIZE;
            _socket = posix::FileDescriptor(); // what is left of the answer must not be met again
            return error;
        }
        const bool isWhole =
            posix::readNetlinkMessages(std::string_view(_buffer.data(), static_cast<std::size_t>(size)),
                                       [&](const posix::NetlinkMessage& message) {
                                           if (message.sequence != _sequence) {
                                               return true; // of an earlier request
                                           }
                                           isTorn = isTorn || (message.flags & NLM_F_DUMP_INTR) != 0;
                                           if (message.type == NLMSG_ERROR) {
                                               result = errorIn(message.payload);
                                           } else if (message.type == NLMSG_DONE) {
                                               result = 0;
                                           } else {
                                               take(message.payload);
                                               if (!isListing && !isAcknowledged) {
                                                   result = 0;
                                               }
                                           }
                                           return !result;
                                       });
        if (!isWhole) {
            _socket = posix::FileDescriptor();
            return EPROTO;
        }
    }
    return *result == 0 && isTorn ? kInterrupted : *result;
}

int KernelNetwork::_open() {
    if (_socket) {
        return 0;
    }
    posix::FileDescriptor socket(::socket(AF_NETLINK, SOCK_RAW | SOCK_CLOEXEC, NETLINK_ROUTE));
    if (!socket) {
        return errno;
    }
    const int on = 1;
    // Has the kernel heed filters; one that cannot lists more, which is looked through here.
    ::setsockopt(socket.get(), SOL_NETLINK, NETLINK_GET_STRICT_CHK, &on, sizeof on);
    ::setsockopt(socket.get(), SOL_SOCKET, SO_RCVTIMEO, &kPatience, sizeof kPatience);
    sockaddr_nl kernel = {};
    kernel.nl_family = AF_NETLINK;
    if (::connect(socket.get(), reinterpret_cast<const sockaddr*>(&kernel), sizeof kernel) != 0) {
        return errno;
    }
    _socket = std::move(socket);
    _buffer.resize(kBufferSize);
    return 0;
}

} // namespace welcomer::local
