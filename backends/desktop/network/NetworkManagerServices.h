// The services that NetworkManager has, and bringing changes of them to it.

#pragma once

#include "backends/desktop/network/NetworkManagerClient.h"
#include "backends/desktop/network/NetworkManagerProfile.h"
#include "platform/NetworkConfigStore.h"

#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace welcomer::desktop {

// One service as it was when it was read, with the changes since.
struct ServiceRecord {
    std::string uuid;
    std::string name;
    std::string path; // of the profile; empty while it is not stored
    std::optional<std::string> device;
    std::string type; // of its interface, where the kernel has no such device
    Protocols protocols;

    std::map<std::string, std::optional<PropertyList::Dictionary>> changedProtocols;
    std::optional<bool> enabled; // only when it was changed
    bool isEstablished = false;  // whether it is to be stored though nothing of it was changed

    bool isChanged() const { return !changedProtocols.empty() || enabled || isEstablished; }
    void forgetChanges();
};

// Reads all services, in order.
//  names  the name for people of each device of the machine
// One thread at a time for each client, as all of this.
std::vector<ServiceRecord> readServices(NetworkManagerClient& client,
                                        const std::map<std::string, std::string>& names);

// Stores the changes of these services, all or nothing as far as NetworkManager lets us. Forgets them when
// that went well.
//  result  0 or a NetworkConfigStatus
std::int32_t storeServices(NetworkManagerClient& client, std::vector<ServiceRecord>& services);

} // namespace welcomer::desktop
