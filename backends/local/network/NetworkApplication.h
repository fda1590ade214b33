// Having the kernel use what is configured.

#pragma once

#include "backends/posix/RootFolder.h"
#include "propertylist/PropertyList.h"

#include <cstdint>
#include <optional>
#include <string>

namespace welcomer::local {

// Whether this process has the right to change the network. Any thread.
bool mayChangeNetwork();

// Configures a device as a service says. Everything that can be checked is checked first: what makes no sense
// changes nothing.
//  "Manual"           the first address, with the first mask, becomes the device's only IPv4
//                     address, and the router
//                     its only default route; an empty or missing router means none. What the kernel refuses
//                     leaves the addresses as they were.
//  "INFORM"           the same; the DHCP clients that are used here cannot ask for the rest alone
//  "DHCP", "BOOTP"    the device loses its IPv4 addresses and default routes, and the
//                     machine's DHCP client is started
//                     for it; it waits for no answer
//  "LinkLocal"        nothing: that is not configured here
//  no method          nothing
// Name servers, where the DNS configuration has some, go to /etc/resolv.conf.
//  ipv4, dns  the configurations, or none
//  detail     receives on failure the device or the file that it is about
//  result     0 or a NetworkConfigStatus
// Blocks for up to a few seconds. One thread at a time for each device.
std::int32_t applyNetworkConfiguration(const posix::RootFolder& root, const std::string& device,
                                       const std::optional<PropertyList::Dictionary>& ipv4,
                                       const std::optional<PropertyList::Dictionary>& dns,
                                       std::string& detail);

} // namespace welcomer::local
