// The network as it is now, and the configuration that is behind it, as a store of keys.

#pragma once

#include "propertylist/PropertyList.h"

#include <memory>
#include <optional>
#include <string>
#include <utility>

namespace welcomer::platform {

// The state domain tells what is, the setup domain what is configured.
enum class NetworkDomain { State, Setup };

// What a key is about. An IPv4 entity holds the names of an IPv4 configuration (NetworkConfigStore.h), a DNS
// entity those of a DNS configuration; the global IPv4 entity also has the text "PrimaryService", the ID of
// the service that the machine's traffic takes; a link entity has the boolean "Active".
enum class NetworkEntity { IPv4, DNS, Link };

inline constexpr char kNetworkPrimaryService[] = "PrimaryService";
inline constexpr char kNetworkActive[] = "Active";

// A key: an entity of the whole machine, of a service by its ID or of an interface by its device name.
struct NetworkStateKey {
    enum class Scope { Global, Service, Interface };

    NetworkDomain domain;
    Scope scope;
    std::string identifier; // empty for the whole machine
    NetworkEntity entity;

    static NetworkStateKey global(NetworkDomain domain, NetworkEntity entity) {
        return {domain, Scope::Global, {}, entity};
    }
    static NetworkStateKey service(NetworkDomain domain, std::string serviceID, NetworkEntity entity) {
        return {domain, Scope::Service, std::move(serviceID), entity};
    }
    static NetworkStateKey interface(NetworkDomain domain, std::string deviceName, NetworkEntity entity) {
        return {domain, Scope::Interface, std::move(deviceName), entity};
    }

    friend auto operator<=>(const NetworkStateKey&, const NetworkStateKey&) = default;
};

class NetworkStateConnection {
  public:
    virtual ~NetworkStateConnection() = default;

    // The value of a key as it is now, or none. Any thread; may read a file and ask the kernel.
    virtual std::optional<PropertyList::Dictionary> copyValue(const NetworkStateKey& key) = 0;
};

class NetworkStateStore {
  public:
    virtual ~NetworkStateStore() = default;

    // Opens a connection under a client's name.
    //  result  null when that fails
    // Any thread.
    virtual std::unique_ptr<NetworkStateConnection> open(const std::string& clientName) = 0;
};

} // namespace welcomer::platform
