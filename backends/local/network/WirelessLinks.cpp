#include "backends/local/network/WirelessLinks.h"

#include "backends/posix/NetlinkSocket.h"

#include <linux/genetlink.h>
#include <linux/nl80211.h>

namespace welcomer::local {

namespace {

// A request for a list, of a family of generic netlink.
posix::NetlinkRequest listRequest(std::uint16_t family, std::uint8_t command) {
    return {family, NLM_F_DUMP, genlmsghdr{command, 1, 0}};
}

template <class Take>
void readAttributes(const nlmsghdr& message, const Take& take) {
    const std::size_t before = NLMSG_HDRLEN + GENL_HDRLEN;
    if (message.nlmsg_len >= before) {
        posix::readAttributes(reinterpret_cast<const char*>(&message) + before, message.nlmsg_len - before,
                              take);
    }
}

} // namespace

std::optional<std::uint16_t> readFamily(const nlmsghdr& message, std::string_view name) {
    bool isIt = false;
    std::uint16_t number = 0;
    readAttributes(message, [&](int type, const nlattr& attribute) {
        if (type == CTRL_ATTR_FAMILY_NAME) {
            isIt = posix::textIn(attribute) == name;
        } else if (type == CTRL_ATTR_FAMILY_ID) {
            number = posix::shortNumberIn(attribute);
        }
    });
    return isIt ? std::optional(number) : std::nullopt;
}

std::optional<int> readWirelessLink(const nlmsghdr& message) {
    std::optional<int> index;
    readAttributes(message, [&](int type, const nlattr& attribute) {
        if (type == NL80211_ATTR_IFINDEX) {
            index = static_cast<int>(posix::numberIn(attribute));
        }
    });
    return index;
}

std::set<int> wirelessLinks() {
    posix::NetlinkSocket socket(NETLINK_GENERIC);
    // Asked for by its name, the kernel would look for a driver that brings it.
    posix::NetlinkRequest families = listRequest(GENL_ID_CTRL, CTRL_CMD_GETFAMILY);
    std::optional<std::uint16_t> wireless;
    socket.list(
        families, [&] { wireless.reset(); },
        [&](const nlmsghdr& message) {
            if (const auto family = readFamily(message, NL80211_GENL_NAME)) {
                wireless = family;
            }
        });
    std::set<int> found;
    if (wireless) {
        posix::NetlinkRequest interfaces = listRequest(*wireless, NL80211_CMD_GET_INTERFACE);
        socket.list(
            interfaces, [&] { found.clear(); },
            [&](const nlmsghdr& message) {
                if (const auto index = readWirelessLink(message)) {
                    found.insert(*index);
                }
            });
    }
    return found;
}

} // namespace welcomer::local
