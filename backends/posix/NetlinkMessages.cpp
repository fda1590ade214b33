#include "backends/posix/NetlinkMessages.h"

#include <algorithm>
#include <arpa/inet.h>
#include <cstring>
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
    const bool isThere = message.nlmsg_len >= NLMSG_LENGTH(sizeof(Body));
    return isThere ? static_cast<const Body*>(NLMSG_DATA(&message)) : nullptr;
}

// The attributes behind that structure.
template <class Body, class Take>
bool readAttributesBehind(const nlmsghdr& message, const Take& take) {
    constexpr std::size_t kBegin = NLMSG_SPACE(sizeof(Body));
    return message.nlmsg_len <= kBegin ||
           readAttributes(reinterpret_cast<const char*>(&message) + kBegin, message.nlmsg_len - kBegin, take);
}

// A number of that size, or 0 when it is none.
template <class Number>
Number valueIn(const nlattr& attribute) {
    const std::string_view data = dataIn(attribute);
    Number number = 0;
    if (data.size() == sizeof number) {
        std::memcpy(&number, data.data(), sizeof number);
    }
    return number;
}

int indexIn(const nlattr& attribute) {
    return static_cast<int>(numberIn(attribute));
}

std::optional<IPv4Address> addressIn(const nlattr& attribute) {
    const bool isAddress = dataIn(attribute).size() == sizeof(IPv4Address);
    return isAddress ? std::optional(ntohl(numberIn(attribute))) : std::nullopt;
}

// What a route with several hops says: the first one, and whether others are on other links.
void readHops(const nlattr& hops, KernelRoute& route) {
    const std::string_view data = dataIn(hops);
    const auto* hop = reinterpret_cast<const rtnexthop*>(data.data());
    int size = static_cast<int>(data.size());
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
    std::string_view left(static_cast<const char*>(begin), size);
    while (left.size() >= NLA_HDRLEN) {
        const auto* const attribute = reinterpret_cast<const nlattr*>(left.data());
        if (attribute->nla_len < NLA_HDRLEN || attribute->nla_len > left.size()) {
            return false;
        }
        take(attribute->nla_type & NLA_TYPE_MASK, *attribute);
        left.remove_prefix(std::min<std::size_t>(NLA_ALIGN(attribute->nla_len), left.size()));
    }
    return left.empty();
}

std::string_view dataIn(const nlattr& attribute) {
    return {reinterpret_cast<const char*>(&attribute) + NLA_HDRLEN,
            static_cast<std::size_t>(attribute.nla_len - NLA_HDRLEN)};
}

std::uint32_t numberIn(const nlattr& attribute) {
    return valueIn<std::uint32_t>(attribute);
}

std::uint16_t shortNumberIn(const nlattr& attribute) {
    return valueIn<std::uint16_t>(attribute);
}

std::string textIn(const nlattr& attribute) {
    const std::string_view text = dataIn(attribute);
    return std::string(text.substr(0, text.find('\0')));
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
            readAttributes(dataIn(each).data(), dataIn(each).size(),
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
    : _bytes(NLMSG_HDRLEN) {
    message().nlmsg_type = type;
    message().nlmsg_flags = static_cast<std::uint16_t>(flags | NLM_F_REQUEST);
    _append(payload);
}

void NetlinkRequest::addNumber(std::uint16_t type, std::uint32_t value) {
    addNested(type, [&] { addBody(value); });
}

void NetlinkRequest::addAddress(std::uint16_t type, IPv4Address address) {
    addNumber(type, htonl(address));
}

void NetlinkRequest::addText(std::uint16_t type, const std::string& text) {
    const std::size_t size = text.size() + 1;
    addBody(nlattr{static_cast<std::uint16_t>(NLA_HDRLEN + size), type});
    _append({text.c_str(), size});
}

std::size_t NetlinkRequest::_open(std::uint16_t type) {
    const std::size_t begin = _bytes.size();
    addBody(nlattr{NLA_HDRLEN, type});
    return begin;
}

void NetlinkRequest::_close(std::size_t begin) {
    reinterpret_cast<nlattr*>(_bytes.data() + begin)->nla_len =
        static_cast<std::uint16_t>(_bytes.size() - begin);
}

void NetlinkRequest::_append(std::string_view data) {
    _bytes.insert(_bytes.end(), data.begin(), data.end());
    _bytes.resize(NLMSG_ALIGN(_bytes.size())); // what comes next begins where it may
    message().nlmsg_len = static_cast<std::uint32_t>(_bytes.size());
}

} // namespace welcomer::posix
