// The services that NetworkManager has, and bringing changes of them to it.

#pragma once

#include "backends/desktop/network/NetworkManagerClient.h"
#include "backends/network/StoredConfiguration.h"

#include <memory>
#include <string>
#include <vector>

namespace welcomer::desktop {

// Reads all services, in order: the profiles, by their UUIDs, and one for each wired device that none fits.
//  interfaces  those of the machine, for the services to have
// One thread at a time for each client, as all of this.
std::vector<network::StoredService>
readServices(NetworkManagerClient& client,
             const std::vector<std::shared_ptr<platform::NetworkInterface>>& interfaces);

// Stores the changes of services, all or nothing as far as NetworkManager lets us.
network::Outcome storeServices(const NetworkManagerBus& bus, std::vector<network::ChangedService>& changed);

// Finds the profile with a UUID.
//  path  receives its path; empty when there is none, which is no failure
network::Outcome findProfile(const NetworkManagerBus& bus, const std::string& uuid, std::string& path);

} // namespace welcomer::desktop
