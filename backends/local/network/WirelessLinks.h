// Which of the kernel's links are wireless.

#pragma once

#include <linux/netlink.h>
#include <optional>
#include <set>
#include <string_view>

namespace welcomer::local {

// The numbers of the wireless links of this network namespace, as the kernel's wireless subsystem has them;
// empty where there is none. Loads nothing into the kernel. Any thread.
std::set<int> wirelessLinks();

// What answers say, or none: the number of a family of generic netlink when it has this name, and the number
// of a wireless link.
std::optional<std::uint16_t> readFamily(const nlmsghdr& message, std::string_view name);
std::optional<int> readWirelessLink(const nlmsghdr& message);

} // namespace welcomer::local
