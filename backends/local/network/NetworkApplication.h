// Having the kernel use what is configured.

#pragma once

#include "backends/local/network/NameServerService.h"
#include "backends/posix/RootFolder.h"
#include "propertylist/PropertyList.h"

#include <cstdint>
#include <optional>
#include <string>

namespace welcomer::local {

// Whether this process has the right to change the network. Any thread.
bool mayChangeNetwork();

// Has a device take a service's configuration (KernelApplier.h). Everything that can be checked is checked
// first: what makes no sense changes nothing.
//  ipv4, dns  the configurations, or none
//  detail     receives on failure the device or the file that it is about
//  nameServers  as KernelApplier has it
//  result     0 or a NetworkConfigStatus
// Blocks for up to a few seconds. One thread at a time for each device.
std::int32_t applyNetworkConfiguration(const posix::RootFolder& root, const std::string& device,
                                       const std::optional<PropertyList::Dictionary>& ipv4,
                                       const std::optional<PropertyList::Dictionary>& dns,
                                       std::string& detail, NameServerService* nameServers = nullptr);

} // namespace welcomer::local
