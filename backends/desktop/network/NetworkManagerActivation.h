// Having a device use its service's profile.

#pragma once

#include "backends/desktop/network/NetworkManagerClient.h"
#include "backends/network/StoredConfiguration.h"

namespace welcomer::desktop {

// Has a service's device use its profile, and waits until it does: with addresses of the service's own until
// it has them, else until it has begun to ask the network and has none of another configuration any more.
// Whether the network answers is for others to find out. At most 90 seconds for each of two attempts. One
// thread at a time for each client.
network::Outcome activateService(NetworkManagerClient& client, const network::StoredService& service,
                                 const network::IPv4Configuration& configuration);

} // namespace welcomer::desktop
