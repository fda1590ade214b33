#include "backends/posix/NetlinkMessages.h"

#include <algorithm>
#include <arpa/inet.h>
#include <cstring>
#include <linux/if_addr.h>
#include <linux/if_link.h>
#include <linux/netlink.h>
#include <linux/rtnetlink.h>
#include <net/if.h>

namespace welcomer::posix {

namespace {

constexpr unsigned int kLowerUp = 1U << 16U; // IFF_LOWER_UP, which <net/if.h> has no name for

constexpr std::size_t aligned(std::size_t size) {
    return (size + NLMSG_ALIGNTO - 1) & ~std::size_t{NLMSG_ALIGNTO - 1};
}

// Takes a structure from the front of a payload, wherever it lies in memory.
template <class Structure>
bool takeStructure(std::string_view& payload, Structure& structure) {
    if (payload.size() < sizeof structure) {
        return false;
    }
    std::memcpy(&structure, payload.data(), sizeof structure);
    payload.remove_prefix(std::min(aligned(sizeof structure), payload.size()));
    return true;
}

// Shows the attributes with their types, flag bits removed.
//  result  false when they are cut off
template <class Take>
bool readAttributes(std::string_view attributes, const Take& take) {
    while (attributes.size() >= sizeof(rtattr)) {
        rtattr header = {};
        std::memcpy(&header, attributes.data(), sizeof header);
        if (header.rta_len < sizeof header || header.rta_len > attributes.size()) {
            return false;
        }
        take(header.rta_type & NLA_TYPE_MASK,
             attributes.substr(sizeof header, header.rta_len - sizeof header));
        attributes.remove_prefix(std::min(aligned(header.rta_len), attributes.size()));
    }
    return attributes.empty();
}

// A number of an attribute; 0 when the attribute is no such number.
std::uint32_t number(std::string_view data) {
    std::uint32_t value = 0;
    if (data.size() == sizeof value) {
        std::memcpy(&value, data.data(), sizeof value);
    }
    return value;
}

int indexIn(std::string_view data) {
    return static_cast<int>(number(data));
}

std::optional<IPv4Address> addressIn(std::string_view data) {
    return data.size() == sizeof(std::uint32_t) ? std::optional(ntohl(number(data))) : std::nullopt;
}

// A text, which may or may not end with a zero byte.
std::string textIn(std::string_view data) {
    return std::string(data.substr(0, data.find('\0')));
}

// The first hop of a route with several.
void readFirstHop(std::string_view hops, KernelRoute& route) {
    rtnexthop hop = {};
    if (hops.size() < sizeof hop) {
        return;
    }
    std::memcpy(&hop, hops.data(), sizeof hop);
    if (hop.rtnh_len < sizeof hop || hop.rtnh_len > hops.size()) {
        return;
    }
    route.linkIndex = hop.rtnh_ifindex;
    readAttributes(hops.substr(sizeof hop, hop.rtnh_len - sizeof hop), [&](int type, std::string_view data) {
        if (type == RTA_GATEWAY) {
            route.gateway = addressIn(data);
        }
    });
}

} // namespace

bool KernelLink::isActive() const {
    return (flags & IFF_UP) != 0 && (flags & kLowerUp) != 0;
}

bool readNetlinkMessages(std::string_view datagram, const std::function<bool(const NetlinkMessage&)>& take) {
    while (!datagram.empty()) {
        nlmsghdr header = {};
        if (datagram.size() < sizeof header) {
            return false;
        }
        std::memcpy(&header, datagram.data(), sizeof header);
        if (header.nlmsg_len < sizeof header || header.nlmsg_len > datagram.size()) {
            return false;
        }
        if (!take({header.nlmsg_type, header.nlmsg_flags, header.nlmsg_seq,
                   datagram.substr(sizeof header, header.nlmsg_len - sizeof header)})) {
            return true;
        }
        datagram.remove_prefix(std::min(aligned(header.nlmsg_len), datagram.size()));
    }
    return true;
}

std::optional<KernelLink> readLink(std::string_view payload) {
    ifinfomsg body = {};
    if (!takeStructure(payload, body) || body.ifi_index <= 0) {
        return std::nullopt;
    }
    KernelLink link;
    link.index = body.ifi_index;
    link.hardwareType = body.ifi_type;
    link.flags = body.ifi_flags;
    bool isElsewhere = false;
    const bool isWhole = readAttributes(payload, [&](int type, std::string_view data) {
        if (type == IFLA_IFNAME) {
            link.name = textIn(data);
        } else if (type == IFLA_LINK) {
            link.linkIndex = indexIn(data);
        } else if (type == IFLA_LINK_NETNSID) {
            isElsewhere = true;
        } else if (type == IFLA_MASTER) {
            link.masterIndex = indexIn(data);
        } else if (type == IFLA_LINKINFO) {
            readAttributes(data, [&](int inner, std::string_view innerData) {
                if (inner == IFLA_INFO_KIND) {
                    link.kind = textIn(innerData);
                }
            });
        }
    });
    if (isElsewhere) {
        link.linkIndex = 0; // the number means a link of another namespace
    }
    return isWhole && !link.name.empty() ? std::optional(link) : std::nullopt;
}

std::optional<KernelAddress> readAddress(std::string_view payload) {
    ifaddrmsg body = {};
    if (!takeStructure(payload, body) || body.ifa_family != AF_INET || body.ifa_prefixlen > 32) {
        return std::nullopt;
    }
    std::optional<IPv4Address> own;
    std::optional<IPv4Address> peer;
    const bool isWhole = readAttributes(payload, [&](int type, std::string_view data) {
        if (type == IFA_LOCAL) {
            own = addressIn(data);
        } else if (type == IFA_ADDRESS) {
            peer = addressIn(data);
        }
    });
    const std::optional<IPv4Address> address = own ? own : peer;
    if (!isWhole || !address) {
        return std::nullopt;
    }
    return KernelAddress{static_cast<int>(body.ifa_index), *address, body.ifa_prefixlen};
}

std::optional<KernelRoute> readDefaultRoute(std::string_view payload) {
    rtmsg body = {};
    if (!takeStructure(payload, body) || body.rtm_family != AF_INET || body.rtm_dst_len != 0 ||
        body.rtm_type != RTN_UNICAST || (body.rtm_flags & RTNH_F_DEAD) != 0) {
        return std::nullopt;
    }
    std::uint32_t table = body.rtm_table;
    KernelRoute route;
    const bool isWhole = readAttributes(payload, [&](int type, std::string_view data) {
        if (type == RTA_TABLE) {
            table = number(data);
        } else if (type == RTA_OIF) {
            route.linkIndex = indexIn(data);
        } else if (type == RTA_GATEWAY) {
            route.gateway = addressIn(data);
        } else if (type == RTA_PRIORITY) {
            route.metric = number(data);
        } else if (type == RTA_MULTIPATH) {
            readFirstHop(data, route);
        }
    });
    return isWhole && table == RT_TABLE_MAIN && route.linkIndex > 0 ? std::optional(route) : std::nullopt;
}

void NetlinkRequest::_begin(std::uint16_t type, std::uint16_t flags) {
    nlmsghdr header = {};
    header.nlmsg_type = type;
    header.nlmsg_flags = static_cast<std::uint16_t>(flags | NLM_F_REQUEST);
    _append(&header, sizeof header);
}

void NetlinkRequest::_append(const void* data, std::size_t size) {
    _bytes.append(static_cast<const char*>(data), size);
    _bytes.resize(aligned(_bytes.size()));
}

void NetlinkRequest::addAttribute(std::uint16_t type, const void* data, std::size_t size) {
    rtattr header = {};
    header.rta_type = type;
    header.rta_len = static_cast<std::uint16_t>(sizeof header + size);
    _bytes.append(reinterpret_cast<const char*>(&header), sizeof header);
    _append(data, size);
}

void NetlinkRequest::addAddress(std::uint16_t type, IPv4Address address) {
    addNumber(type, htonl(address));
}

std::string_view NetlinkRequest::bytes(std::uint32_t sequence) {
    nlmsghdr header = {};
    std::memcpy(&header, _bytes.data(), sizeof header);
    header.nlmsg_len = static_cast<std::uint32_t>(_bytes.size());
    header.nlmsg_seq = sequence;
    std::memcpy(_bytes.data(), &header, sizeof header);
    return _bytes;
}

} // namespace welcomer::posix
