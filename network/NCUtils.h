// Small helpers over the persistent network configuration.

#pragma once

#include "platform/NetworkConfigStore.h"

#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace welcomer {

// Class operations without state. A null set, service or list entry has nothing in it; missing arguments, an
// empty name, key or ID among them, give none. One thread at a time for each connection of the store.
class NCUtils {
  public:
    using Services = std::vector<std::shared_ptr<platform::NetworkService>>;

    NCUtils() = delete;

    // The set's first service with this user-visible name, or null.
    static std::shared_ptr<platform::NetworkService>
    serviceInSetWithName(platform::NetworkSet* set, const std::optional<std::string>& name);

    // Every service of the set whose interface chain holds an interface of the type, in the set's order; none
    // without a key and when the set's services cannot be listed.
    //  hardwareKey  an interface type
    static std::optional<Services>
    servicesInSetWithHardwareKey(platform::NetworkSet* set, const std::optional<std::string>& hardwareKey);

    // The first of them, or null.
    static std::shared_ptr<platform::NetworkService>
    serviceInSetWithHardwareKey(platform::NetworkSet* set, const std::optional<std::string>& hardwareKey);

    // The first service with this ID, compared character by character, or null. Borrowed from the list.
    static platform::NetworkService* serviceInArrayWithID(const std::optional<Services>& services,
                                                          const std::optional<std::string>& serviceID);

    // The first interface of the type in the service's interface chain, or null. Borrowed from the service.
    static platform::NetworkInterface* interfaceInServiceWithType(platform::NetworkService* service,
                                                                  const std::string& type);

    // The service's protocol of the type, which is added where it is missing; null when that fails, which is
    // logged with the store's error code.
    static std::shared_ptr<platform::NetworkProtocol>
    createOrGetProtocolForService(const std::string& type, platform::NetworkService* service);

    // Copies the types and configurations of all protocols. A protocol that the destination has already keeps
    // its configuration. Failures are logged, and the next protocol follows.
    static void copyProtocolsFromServiceToService(platform::NetworkService* source,
                                                  platform::NetworkService* destination);
};

} // namespace welcomer
