#include "backends/posix/NetlinkMessages.h"

#include <arpa/inet.h>
#include <cstring>
#include <libmnl/libmnl.h>
#include <linux/if_addr.h>
#include <linux/if_link.h>
#include <linux/rtnetlink.h>
#include <net/if.h>

namespace welcomer::posix {

namespace {

constexpr unsigned int kLowerUp = 1U << 16U; // IFF_LOWER_UP, which <net/if.h> has no name for

// The structure that a message begins with, or null when it is too short for that.
template <class Body>
const Body* bodyOf(const nlmsghdr& message) {
    const bool isThere = mnl_nlmsg_get_payload_len(&message) >= sizeof(Body);
    return isThere ? static_cast<const Body*>(mnl_nlmsg_get_payload(&message)) : nullptr;
}

// The attributes behind that structure.
template <class Body, class Take>
bool readAttributesBehind(const nlmsghdr& message, const Take& take) {
    return readAttributes(mnl_nlmsg_get_payload_offset(&message, sizeof(Body)),
                          mnl_nlmsg_get_payload_len(&message) - sizeof(Body), take);
}

int indexIn(const nlattr& attribute) {
    return static_cast<int>(numberIn(attribute));
}

std::optional<IPv4Address> addressIn(const nlattr& attribute) {
    const bool isAddress = mnl_attr_get_payload_len(&attribute) == sizeof(IPv4Address);
    return isAddress ? std::optional(ntohl(numberIn(attribute))) : std::nullopt;
}

// What a route with several hops says: the first one, and whether others are on other links.
void readHops(const nlattr& hops, KernelRoute& route) {
    const auto* hop = static_cast<const rtnexthop*>(mnl_attr_get_payload(&hops));
    int size = mnl_attr_get_payload_len(&hops);
    while (size >= static_cast<int>(sizeof *hop) && RTNH_OK(hop, size)) {
        if (route.linkIndex == 0) {
            route.linkIndex = hop->rtnh_ifindex;
            readAttributes(RTNH_DATA(hop), hop->rtnh_len - sizeof *hop, [&](int type, const nlattr& each) {
                if (type == RTA_GATEWAY) {
                    route.gateway = addressIn(each);
                }
            });
        }
        route.isShared = route.isShared || hop->rtnh_ifindex != route.linkIndex;
        size -= RTNH_ALIGN(hop->rtnh_len);
        hop = RTNH_NEXT(hop);
    }
}

} // namespace

bool KernelLink::isActive() const {
    return (flags & IFF_UP) != 0 && (flags & kLowerUp) != 0;
}

bool readAttributes(const void* begin, std::size_t size,
                    const std::function<void(int type, const nlattr& attribute)>& take) {
    const auto* attribute = static_cast<const nlattr*>(begin);
    const auto left = [&] {
        return static_cast<int>(static_cast<const char*>(begin) + size -
                                reinterpret_cast<const char*>(attribute));
    };
    for (; mnl_attr_ok(attribute, left()); attribute = mnl_attr_next(attribute)) {
        take(mnl_attr_get_type(attribute), *attribute);
    }
    return left() <= 0;
}

std::uint32_t numberIn(const nlattr& attribute) {
    const bool isNumber = mnl_attr_get_payload_len(&attribute) == sizeof(std::uint32_t);
    return isNumber ? mnl_attr_get_u32(&attribute) : 0;
}

std::uint16_t shortNumberIn(const nlattr& attribute) {
    const bool isNumber = mnl_attr_get_payload_len(&attribute) == sizeof(std::uint16_t);
    return isNumber ? mnl_attr_get_u16(&attribute) : std::uint16_t{0};
}

std::string textIn(const nlattr& attribute) {
    const char* const text = mnl_attr_get_str(&attribute);
    return {text, ::strnlen(text, mnl_attr_get_payload_len(&attribute))};
}

std::optional<KernelLink> readLink(const nlmsghdr& message) {
    const auto* const body = bodyOf<ifinfomsg>(message);
    if (!body || body->ifi_index <= 0) {
        return std::nullopt;
    }
    KernelLink link;
    link.index = body->ifi_index;
    link.hardwareType = body->ifi_type;
    link.flags = body->ifi_flags;
    bool isElsewhere = false;
    const bool isWhole = readAttributesBehind<ifinfomsg>(message, [&](int type, const nlattr& each) {
        if (type == IFLA_IFNAME) {
            link.name = textIn(each);
        } else if (type == IFLA_LINK) {
            link.linkIndex = indexIn(each);
        } else if (type == IFLA_LINK_NETNSID) {
            isElsewhere = true;
        } else if (type == IFLA_MASTER) {
            link.masterIndex = indexIn(each);
        } else if (type == IFLA_LINKINFO) {
            readAttributes(mnl_attr_get_payload(&each), mnl_attr_get_payload_len(&each),
                           [&](int inner, const nlattr& information) {
                               if (inner == IFLA_INFO_KIND) {
                                   link.kind = textIn(information);
                               }
                           });
        }
    });
    if (isElsewhere) {
        link.linkIndex = 0; // the number means a link of another namespace
    }
    return isWhole && !link.name.empty() ? std::optional(link) : std::nullopt;
}

std::optional<KernelAddress> readAddress(const nlmsghdr& message) {
    const auto* const body = bodyOf<ifaddrmsg>(message);
    if (!body || body->ifa_family != AF_INET || body->ifa_prefixlen > 32) {
        return std::nullopt;
    }
    std::optional<IPv4Address> own;
    std::optional<IPv4Address> peer;
    const bool isWhole = readAttributesBehind<ifaddrmsg>(message, [&](int type, const nlattr& each) {
        if (type == IFA_LOCAL) {
            own = addressIn(each);
        } else if (type == IFA_ADDRESS) {
            peer = addressIn(each);
        }
    });
    const std::optional<IPv4Address> address = own ? own : peer;
    if (!isWhole || !address) {
        return std::nullopt;
    }
    return KernelAddress{static_cast<int>(body->ifa_index), *address, body->ifa_prefixlen};
}

std::optional<KernelRoute> readDefaultRoute(const nlmsghdr& message) {
    const auto* const body = bodyOf<rtmsg>(message);
    if (!body || body->rtm_family != AF_INET || body->rtm_dst_len != 0) {
        return std::nullopt;
    }
    std::uint32_t table = body->rtm_table;
    KernelRoute route;
    const bool isWhole = readAttributesBehind<rtmsg>(message, [&](int type, const nlattr& each) {
        if (type == RTA_TABLE) {
            table = numberIn(each);
        } else if (type == RTA_OIF) {
            route.linkIndex = indexIn(each);
        } else if (type == RTA_GATEWAY) {
            route.gateway = addressIn(each);
        } else if (type == RTA_PRIORITY) {
            route.metric = numberIn(each);
        } else if (type == RTA_MULTIPATH) {
            readHops(each, route);
        }
    });
    route.isUsable =
        body->rtm_type == RTN_UNICAST && (body->rtm_flags & RTNH_F_DEAD) == 0 && route.linkIndex > 0;
    return isWhole && table == RT_TABLE_MAIN ? std::optional(route) : std::nullopt;
}

NetlinkRequest::NetlinkRequest(std::uint16_t type, std::uint16_t flags, std::string_view payload)
    : _bytes(MNL_NLMSG_HDRLEN) {
    nlmsghdr* const header = mnl_nlmsg_put_header(_bytes.data());
    header->nlmsg_type = type;
    header->nlmsg_flags = static_cast<std::uint16_t>(flags | NLM_F_REQUEST);
    _append(payload);
}

void NetlinkRequest::addNumber(std::uint16_t type, std::uint32_t value) {
    addNested(type, [&] { addBody(value); });
}

void NetlinkRequest::addAddress(std::uint16_t type, IPv4Address address) {
    addNumber(type, htonl(address));
}

void NetlinkRequest::addText(std::uint16_t type, const std::string& text) {
    _bytes.resize(message().nlmsg_len + MNL_ATTR_HDRLEN + MNL_ALIGN(text.size() + 1));
    mnl_attr_put_strz(&message(), type, text.c_str());
}

std::size_t NetlinkRequest::_open(std::uint16_t type) {
    const std::size_t begin = message().nlmsg_len;
    _bytes.resize(begin + MNL_ATTR_HDRLEN);
    mnl_attr_put(&message(), type, 0, nullptr);
    return begin;
}

void NetlinkRequest::_close(std::size_t begin) {
    mnl_attr_nest_end(&message(), reinterpret_cast<nlattr*>(_bytes.data() + begin));
}

void NetlinkRequest::_append(std::string_view data) {
    const std::size_t begin = message().nlmsg_len;
    _bytes.resize(begin + MNL_ALIGN(data.size()));
    data.copy(static_cast<char*>(mnl_nlmsg_put_extra_header(&message(), data.size())), data.size());
}

} // namespace welcomer::posix
