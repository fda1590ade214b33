#include "backends/local/network/LinkSnapshot.h"

#include <algorithm>
#include <cstring>
#include <linux/if_addr.h>
#include <linux/rtnetlink.h>
#include <net/if.h>
#include <string_view>

namespace welcomer::local {

namespace {

// Of a hop's flags, those that are said to the kernel; it says others itself.
constexpr unsigned char kSaidOfHops = RTNH_F_ONLINK | RTNH_F_PERVASIVE;

template <class Body>
Body* bodyIn(std::string& payload) {
    return reinterpret_cast<Body*>(payload.data());
}

std::string payloadOf(const nlmsghdr& message) {
    return {reinterpret_cast<const char*>(&message) + NLMSG_HDRLEN, message.nlmsg_len - NLMSG_HDRLEN};
}

template <class Body, class Take>
void readAttributes(const std::string& payload, const Take& take) {
    posix::readAttributes(payload.data() + sizeof(Body), payload.size() - sizeof(Body), take);
}

std::string_view bytesOf(const nlattr& attribute) {
    return {reinterpret_cast<const char*>(&attribute), attribute.nla_len};
}

// The message's structure, and behind it the attributes that are wanted.
template <class Body, class IsWanted>
std::string reduced(const std::string& payload, const IsWanted& isWanted) {
    std::string result = payload.substr(0, sizeof(Body));
    readAttributes<Body>(payload, [&](int type, const nlattr& attribute) {
        if (isWanted(type)) {
            result += bytesOf(attribute);
            result.resize(NLMSG_ALIGN(result.size()));
        }
    });
    return result;
}

// Shows the hops of a route that has several.
template <class Take>
void readHops(const nlattr& attribute, const Take& take) {
    auto* hop = reinterpret_cast<rtnexthop*>(const_cast<nlattr*>(&attribute) + 1);
    int size = attribute.nla_len - static_cast<int>(sizeof attribute);
    for (; size >= static_cast<int>(sizeof *hop) && RTNH_OK(hop, size); hop = RTNH_NEXT(hop)) {
        take(*hop);
        size -= RTNH_ALIGN(hop->rtnh_len);
    }
}

} // namespace

int LinkSnapshot::take() {
    const int error = _readAddresses(_addresses);
    return error != 0 ? error : _readRoutes(_routes);
}

void LinkSnapshot::restore() {
    if (!_wasUp) {
        ifinfomsg down = {};
        down.ifi_index = _linkIndex;
        down.ifi_change = IFF_UP;
        posix::NetlinkRequest request(RTM_NEWLINK, 0, down);
        _socket.ask(request);
    }
    _restoreAddresses();
    _restoreRoutes();
}

int LinkSnapshot::_readAddresses(Entries& found) {
    ifaddrmsg body = {};
    body.ifa_family = AF_INET;
    body.ifa_index = static_cast<unsigned int>(_linkIndex); // kernels that know no filter list all
    posix::NetlinkRequest request(RTM_GETADDR, NLM_F_DUMP, body);
    return _socket.list(
        request, [&] { found.clear(); },
        [&](const nlmsghdr& message) {
            Entry entry;
            entry.payload = payloadOf(message);
            if (bodyIn<ifaddrmsg>(entry.payload)->ifa_index == body.ifa_index) {
                entry.key = reduced<ifaddrmsg>(entry.payload, [](int type) { return type != IFA_CACHEINFO; });
                found.push_back(std::move(entry));
            }
        });
}

int LinkSnapshot::_readRoutes(Entries& found) {
    rtmsg body = {};
    body.rtm_family = AF_INET;
    posix::NetlinkRequest request(RTM_GETROUTE, NLM_F_DUMP, body);
    return _socket.list(
        request, [&] { found.clear(); },
        [&](const nlmsghdr& message) {
            Entry entry;
            entry.payload = payloadOf(message);
            rtmsg& route = *bodyIn<rtmsg>(entry.payload);
            if (route.rtm_family != AF_INET || (route.rtm_flags & RTM_F_CLONED) != 0) {
                return;
            }
            route.rtm_flags &= kSaidOfHops;
            entry.scope = route.rtm_scope;
            bool isOurs = false;
            readAttributes<rtmsg>(entry.payload, [&](int type, const nlattr& attribute) {
                isOurs =
                    isOurs || (type == RTA_OIF && static_cast<int>(posix::numberIn(attribute)) == _linkIndex);
                if (type == RTA_MULTIPATH) {
                    readHops(attribute, [&](rtnexthop& hop) {
                        hop.rtnh_flags &= kSaidOfHops;
                        isOurs = isOurs || hop.rtnh_ifindex == _linkIndex;
                    });
                }
            });
            entry.key = entry.payload;
            entry.group = reduced<rtmsg>(entry.payload, [](int type) {
                return type == RTA_DST || type == RTA_TABLE || type == RTA_PRIORITY;
            });
            rtmsg& place = *bodyIn<rtmsg>(entry.group);
            place.rtm_protocol = place.rtm_scope = place.rtm_type = 0;
            place.rtm_flags = 0;
            if (isOurs) {
                found.push_back(std::move(entry));
                return;
            }
            for (Entry& each : found) {
                each.precedesOthers = each.precedesOthers || each.group == entry.group;
            }
        });
}

void LinkSnapshot::_restoreAddresses() {
    Entries now;
    _readAddresses(now);
    for (const Entry& each : now) {
        if (std::ranges::count(_addresses, each) == 0) {
            _send(RTM_DELADDR, 0, each);
        }
    }
    if (_readAddresses(now) == 0 && now == _addresses) {
        return;
    }
    for (const Entry& each : now) {
        _send(RTM_DELADDR, 0, each);
    }
    for (const Entry& each : _addresses) {
        _send(RTM_NEWADDR, NLM_F_CREATE | NLM_F_EXCL, each);
    }
}

void LinkSnapshot::_restoreRoutes() {
    Entries now;
    _readRoutes(now);
    Entries missing;
    std::ranges::copy_if(_routes, std::back_inserter(missing),
                         [&](const Entry& each) { return std::ranges::count(now, each) == 0; });
    const auto isOfMissingGroup = [&](const Entry& entry) {
        return std::ranges::any_of(missing, [&](const Entry& each) { return each.group == entry.group; });
    };
    for (const Entry& each : now) {
        // What stands in the place of a missing one is put back behind it.
        if (std::ranges::count(_routes, each) == 0 || isOfMissingGroup(each)) {
            _send(RTM_DELROUTE, 0, each);
        }
    }
    Entries before;
    Entries after;
    for (const Entry& each : _routes) {
        if (isOfMissingGroup(each)) {
            each.precedesOthers ? before.insert(before.begin(), each) : after.insert(after.end(), each);
        }
    }
    std::ranges::copy(after, std::back_inserter(before));
    std::ranges::stable_sort(before, std::ranges::greater(), &Entry::scope);
    for (const Entry& each : before) {
        _send(RTM_NEWROUTE, each.precedesOthers ? NLM_F_CREATE : NLM_F_CREATE | NLM_F_APPEND, each);
    }
}

void LinkSnapshot::_send(std::uint16_t type, std::uint16_t flags, const Entry& entry) {
    posix::NetlinkRequest request(type, flags, entry.payload);
    _socket.ask(request);
}

} // namespace welcomer::local
