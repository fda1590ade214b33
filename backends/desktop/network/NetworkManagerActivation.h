// Having a device use its service's profile.

#pragma once

#include "backends/desktop/network/NetworkManagerServices.h"

namespace welcomer::desktop {

// Has a service's device use its profile, and waits for the result: at most 90 seconds for each of two
// attempts.
//  result  0 or a NetworkConfigStatus
// One thread at a time for each client.
std::int32_t activateService(NetworkManagerClient& client, const ServiceRecord& service);

} // namespace welcomer::desktop
