#include "backends/posix/KernelNetwork.h"

#include <algorithm>
#include <cerrno>
#include <linux/if_addr.h>
#include <linux/if_link.h>
#include <linux/rtnetlink.h>
#include <net/if.h>

namespace welcomer::posix {

namespace {

constexpr std::uint32_t kWithoutStatistics = 1U << 3U; // RTEXT_FILTER_SKIP_STATS

ifinfomsg linkBody(int index) {
    ifinfomsg body = {};
    body.ifi_family = AF_UNSPEC;
    body.ifi_index = index;
    return body;
}

NetlinkRequest addressRequest(std::uint16_t type, std::uint16_t flags, const KernelAddress& address) {
    ifaddrmsg body = {};
    body.ifa_family = AF_INET;
    body.ifa_prefixlen = static_cast<unsigned char>(address.prefixLength);
    body.ifa_index = static_cast<unsigned int>(address.linkIndex);
    NetlinkRequest request(type, flags, body);
    request.addAddress(IFA_LOCAL, address.address);
    request.addAddress(IFA_ADDRESS, address.address);
    return request;
}

NetlinkRequest routeRequest(std::uint16_t type, std::uint16_t flags, const KernelRoute& route) {
    rtmsg body = {};
    body.rtm_family = AF_INET;
    body.rtm_table = RT_TABLE_MAIN;
    const bool isAdded = type == RTM_NEWROUTE;
    body.rtm_protocol = isAdded ? RTPROT_STATIC : RTPROT_UNSPEC;
    body.rtm_scope = !isAdded ? RT_SCOPE_NOWHERE : RT_SCOPE_UNIVERSE;
    body.rtm_type = isAdded ? RTN_UNICAST : RTN_UNSPEC;
    NetlinkRequest request(type, flags, body);
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
int KernelNetwork::_list(NetlinkRequest& request, std::optional<Value> (*read)(const nlmsghdr& message),
                         std::vector<Value>& found) {
    return _socket.list(
        request, [&] { found.clear(); },
        [&](const nlmsghdr& message) {
            if (auto value = read(message)) {
                found.push_back(std::move(*value));
            }
        });
}

std::vector<KernelLink> KernelNetwork::links() {
    NetlinkRequest request(RTM_GETLINK, NLM_F_DUMP, linkBody(0));
    request.addNumber(IFLA_EXT_MASK, kWithoutStatistics);
    std::vector<KernelLink> found;
    _list(request, readLink, found);
    std::ranges::stable_sort(found, {}, &KernelLink::index);
    return found;
}

std::optional<KernelLink> KernelNetwork::linkNamed(const std::string& name) {
    if (name.empty() || name.size() >= IFNAMSIZ) {
        return std::nullopt;
    }
    NetlinkRequest request(RTM_GETLINK, 0, linkBody(0));
    request.addText(IFLA_IFNAME, name);
    return _oneLink(request);
}

std::optional<KernelLink> KernelNetwork::linkNumbered(int index) {
    NetlinkRequest request(RTM_GETLINK, 0, linkBody(index));
    return _oneLink(request);
}

std::optional<KernelLink> KernelNetwork::_oneLink(NetlinkRequest& request) {
    request.addNumber(IFLA_EXT_MASK, kWithoutStatistics);
    std::optional<KernelLink> found;
    _socket.ask(request, [&](const nlmsghdr& message) { found = readLink(message); });
    return found;
}

std::vector<KernelAddress> KernelNetwork::addressesOf(int linkIndex) {
    std::vector<KernelAddress> found;
    listAddresses(linkIndex, found);
    return found;
}

std::vector<KernelRoute> KernelNetwork::defaultRoutes() {
    std::vector<KernelRoute> found;
    listDefaultRoutes(found);
    return found;
}

int KernelNetwork::listAddresses(int linkIndex, std::vector<KernelAddress>& found) {
    ifaddrmsg body = {};
    body.ifa_family = AF_INET;
    body.ifa_index = static_cast<unsigned int>(linkIndex); // kernels that know no filter list all
    NetlinkRequest request(RTM_GETADDR, NLM_F_DUMP, body);
    const int error = _list(request, readAddress, found);
    std::erase_if(found, [&](const KernelAddress& each) { return each.linkIndex != linkIndex; });
    return error;
}

int KernelNetwork::listDefaultRoutes(std::vector<KernelRoute>& found) {
    rtmsg body = {};
    body.rtm_family = AF_INET;
    body.rtm_table = RT_TABLE_MAIN;
    NetlinkRequest request(RTM_GETROUTE, NLM_F_DUMP, body);
    return _list(request, readDefaultRoute, found);
}

int KernelNetwork::setUp(int linkIndex, bool isUp) {
    ifinfomsg body = linkBody(linkIndex);
    body.ifi_flags = isUp ? IFF_UP : 0;
    body.ifi_change = IFF_UP;
    NetlinkRequest request(RTM_NEWLINK, 0, body);
    return _socket.ask(request);
}

int KernelNetwork::addAddress(const KernelAddress& address) {
    NetlinkRequest request = addressRequest(RTM_NEWADDR, NLM_F_CREATE | NLM_F_REPLACE, address);
    if (address.prefixLength > 0 && address.prefixLength < 31) {
        request.addAddress(IFA_BROADCAST, address.address | (~IPv4Address{0} >> address.prefixLength));
    }
    return unless(EEXIST, _socket.ask(request));
}

int KernelNetwork::removeAddress(const KernelAddress& address) {
    NetlinkRequest request = addressRequest(RTM_DELADDR, 0, address);
    return unless(EADDRNOTAVAIL, _socket.ask(request));
}

int KernelNetwork::addDefaultRoute(const KernelRoute& route) {
    NetlinkRequest request = routeRequest(RTM_NEWROUTE, NLM_F_CREATE | NLM_F_REPLACE, route);
    return _socket.ask(request);
}

int KernelNetwork::removeDefaultRoute(const KernelRoute& route) {
    NetlinkRequest request = routeRequest(RTM_DELROUTE, 0, route);
    return unless(ESRCH, _socket.ask(request));
}

} // namespace welcomer::posix
