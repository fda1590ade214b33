// Bringing a connection profile in line with the protocols of a service.

#pragma once

#include "backends/desktop/network/NetworkManagerSettings.h"
#include "backends/network/StoredConfiguration.h"

#include <NetworkManager.h>

#include <cstdint>
#include <string>

namespace welcomer::desktop {

// Keeps a service's protocols in the profile's user data, in pieces, and brings its settings in line with
// what they ask for. An automatic configuration with an address is allowed to fail and gets IPv6 for the link
// alone, since the address would go with the first attempt otherwise; another method puts IPv6 back.
//  profile  not normalized; a setting that is missing is added
//  result   0 or a NetworkConfigStatus: what cannot be kept
// Any thread; one at a time for each profile.
std::int32_t writeProtocols(NMConnection* profile, const network::StoredService& service,
                            const network::IPv4Configuration& configuration);

// A new profile of a wired device: automatic, to be used as soon as the device is there.
// The caller owns it.
NMConnection* newWiredProfile(const std::string& device, const std::string& name, const std::string& uuid);

} // namespace welcomer::desktop
