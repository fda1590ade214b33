// Having the machine use what is stored of its network.

#pragma once

#include "backends/network/NameServerService.h"
#include "backends/network/StoredConfiguration.h"
#include "backends/posix/RootFolder.h"

#include <chrono>
#include <string>
#include <vector>

namespace welcomer::local {

// What came of one service.
struct RestoredService {
    std::string device;
    network::Outcome outcome;
};

// Has the machine use every service of the set in use that is enabled, in their order, through the kernel: as
// at the machine's start, when nothing is configured yet. A service that says nothing of it is enabled. One
// whose device is a port of a bridge or a bond is passed over.
//  nameServers  as KernelApplier.h has it; borrowed, or null
//  patience     how long to wait for devices that are not there yet
//  result       one for each; one that failed does not keep the others from being used
// Any thread; blocks for a few seconds, and for the patience.
std::vector<RestoredService> restoreStoredNetwork(const posix::RootFolder& root,
                                                  network::NameServerService* nameServers,
                                                  std::chrono::milliseconds patience);

} // namespace welcomer::local
