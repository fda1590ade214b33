// The kernel's links as interfaces of the network configuration.

#pragma once

#include "backends/posix/NetlinkMessages.h"
#include "platform/NetworkConfigStore.h"

#include <memory>
#include <set>
#include <string>
#include <vector>

namespace welcomer::local {

// A link with the type that its interface has.
struct MachineLink {
    posix::KernelLink link;
    std::string type;
};

// Every link but the loopback, in the order of their numbers. A bridge, a bond, a VLAN and the like have
// types of their own; what else speaks Ethernet is Ethernet unless it is wireless.
//  links     all links; by default those of this network namespace, whatever /sys shows
//  wireless  the numbers of the wireless ones
// Any thread.
std::vector<MachineLink> listMachineLinks();
std::vector<MachineLink> listMachineLinks(const std::vector<posix::KernelLink>& links,
                                          const std::set<int>& wireless);

// Whether a device is a port of a bridge or a bond, which has the addresses in its place; no device of the
// list is none.
bool isPort(const std::vector<MachineLink>& links, const std::string& device);

// The links that are network hardware as far as a service is concerned: Ethernet, wireless, and bridges and
// bonds that have taken over some; not those that are ports of another link.
std::vector<MachineLink> listHardware(const std::vector<MachineLink>& links);

// An interface with what it stands on: a bridge or a bond on its first port, a VLAN and the like on their
// link.
//  device  a device of the list, or another one, which then has no type
//  link    a link of the list
// Never null.
std::unique_ptr<platform::NetworkInterface> makeInterface(const std::vector<MachineLink>& links,
                                                          const std::string& device);
std::unique_ptr<platform::NetworkInterface> makeInterface(const std::vector<MachineLink>& links,
                                                          const MachineLink& link);

// The name for people of a device: "Ethernet (eth0)".
std::string displayNameOf(const std::string& type, const std::string& device);

} // namespace welcomer::local
