#include "backends/local/network/KernelNetwork.h"

#include <algorithm>
#include <cerrno>
#include <linux/if_addr.h>
#include <linux/if_link.h>
#include <linux/rtnetlink.h>
#include <net/if.h>

namespace welcomer::local {

namespace {

constexpr std::uint32_t kWithoutStatistics = 1U << 3U; // RTEXT_FILTER_SKIP_STATS

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

int unless(int tolerated, int error) {
    return error == tolerated ? 0 : error;
}

} // namespace

template <class Value>
int KernelNetwork::_list(posix::NetlinkRequest& request,
                         std::optional<Value> (*read)(const nlmsghdr& message), std::vector<Value>& found) {
    return _socket.list(
        request, [&] { found.clear(); },
        [&](const nlmsghdr& message) {
            if (auto value = read(message)) {
                found.push_back(std::move(*value));
            }
        });
}

std::vector<posix::KernelLink> KernelNetwork::links() {
    posix::NetlinkRequest request(RTM_GETLINK, NLM_F_DUMP, linkBody(0));
    request.addNumber(IFLA_EXT_MASK, kWithoutStatistics);
    std::vector<posix::KernelLink> found;
    _list(request, posix::readLink, found);
    std::ranges::stable_sort(found, {}, &posix::KernelLink::index);
    return found;
}

std::optional<posix::KernelLink> KernelNetwork::linkNamed(const std::string& name) {
    if (name.empty() || name.size() >= IFNAMSIZ) {
        return std::nullopt;
    }
    posix::NetlinkRequest request(RTM_GETLINK, 0, linkBody(0));
    request.addText(IFLA_IFNAME, name);
    return _oneLink(request);
}

std::optional<posix::KernelLink> KernelNetwork::linkNumbered(int index) {
    posix::NetlinkRequest request(RTM_GETLINK, 0, linkBody(index));
    return _oneLink(request);
}

std::optional<posix::KernelLink> KernelNetwork::_oneLink(posix::NetlinkRequest& request) {
    request.addNumber(IFLA_EXT_MASK, kWithoutStatistics);
    std::optional<posix::KernelLink> found;
    _socket.ask(request, [&](const nlmsghdr& message) { found = posix::readLink(message); });
    return found;
}

std::vector<posix::KernelAddress> KernelNetwork::addressesOf(int linkIndex) {
    std::vector<posix::KernelAddress> found;
    listAddresses(linkIndex, found);
    return found;
}

std::vector<posix::KernelRoute> KernelNetwork::defaultRoutes() {
    std::vector<posix::KernelRoute> found;
    listDefaultRoutes(found);
    return found;
}

int KernelNetwork::listAddresses(int linkIndex, std::vector<posix::KernelAddress>& found) {
    ifaddrmsg body = {};
    body.ifa_family = AF_INET;
    body.ifa_index = static_cast<unsigned int>(linkIndex); // kernels that know no filter list all
    posix::NetlinkRequest request(RTM_GETADDR, NLM_F_DUMP, body);
    const int error = _list(request, posix::readAddress, found);
    std::erase_if(found, [&](const posix::KernelAddress& each) { return each.linkIndex != linkIndex; });
    return error;
}

int KernelNetwork::listDefaultRoutes(std::vector<posix::KernelRoute>& found) {
    rtmsg body = {};
    body.rtm_family = AF_INET;
    body.rtm_table = RT_TABLE_MAIN;
    posix::NetlinkRequest request(RTM_GETROUTE, NLM_F_DUMP, body);
    return _list(request, posix::readDefaultRoute, found);
}

int KernelNetwork::setUp(int linkIndex, bool isUp) {
    ifinfomsg body = linkBody(linkIndex);
    body.ifi_flags = isUp ? IFF_UP : 0;
    body.ifi_change = IFF_UP;
    posix::NetlinkRequest request(RTM_NEWLINK, 0, body);
    return _socket.ask(request);
}

int KernelNetwork::addAddress(const posix::KernelAddress& address) {
    posix::NetlinkRequest request = addressRequest(RTM_NEWADDR, NLM_F_CREATE | NLM_F_REPLACE, address);
    if (address.prefixLength > 0 && address.prefixLength < 31) {
        request.addAddress(IFA_BROADCAST, address.address | (~posix::IPv4Address{0} >> address.prefixLength));
    }
    return unless(EEXIST, _socket.ask(request));
}

int KernelNetwork::removeAddress(const posix::KernelAddress& address) {
    posix::NetlinkRequest request = addressRequest(RTM_DELADDR, 0, address);
    return unless(EADDRNOTAVAIL, _socket.ask(request));
}

int KernelNetwork::addDefaultRoute(const posix::KernelRoute& route) {
    posix::NetlinkRequest request = routeRequest(RTM_NEWROUTE, NLM_F_CREATE | NLM_F_REPLACE, route);
    return _socket.ask(request);
}

int KernelNetwork::removeDefaultRoute(const posix::KernelRoute& route) {
    posix::NetlinkRequest request = routeRequest(RTM_DELROUTE, 0, route);
    return unless(ESRCH, _socket.ask(request));
}

} // namespace welcomer::local
