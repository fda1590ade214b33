#include "backends/desktop/network/NetworkManagerStateStore.h"

#include "backends/desktop/network/NetworkManagerBus.h"
#include "backends/desktop/network/NetworkManagerSettings.h"
#include "platform/NetworkConfigStore.h"

#include <nm-dbus-interface.h>

#include <algorithm>
#include <arpa/inet.h>
#include <array>
#include <mutex>
#include <utility>

namespace welcomer::desktop {

namespace {

using platform::NetworkDomain;
using platform::NetworkEntity;
using platform::NetworkStateKey;
using Dictionary = PropertyList::Dictionary;
using Array = PropertyList::Array;
using Value = std::optional<Dictionary>;

// The addresses and masks of an IPv4 configuration; none when it has none.
Value addressesOf(const NetworkManagerProperties& configuration) {
    AddressTexts texts = readAddresses(configuration.value("AddressData", "aa{sv}").get());
    if (texts.addresses.empty()) {
        return std::nullopt;
    }
    return Dictionary{{platform::kNetworkAddresses, std::move(texts.addresses)},
                      {platform::kNetworkSubnetMasks, std::move(texts.masks)}};
}

void addIPv4Servers(const NetworkManagerProperties& configuration, Array& servers) {
    const VariantPointer list = configuration.value("NameserverData", "aa{sv}");
    for (gsize index = 0; list && index < g_variant_n_children(list.get()); ++index) {
        const VariantPointer each(g_variant_get_child_value(list.get(), index));
        const char* address = nullptr;
        if (g_variant_lookup(each.get(), "address", "&s", &address) != FALSE) {
            servers.emplace_back(address);
        }
    }
}

void addIPv6Servers(const NetworkManagerProperties& configuration, Array& servers) {
    const VariantPointer list = configuration.value("Nameservers", "aay");
    for (gsize index = 0; list && index < g_variant_n_children(list.get()); ++index) {
        const VariantPointer each(g_variant_get_child_value(list.get(), index));
        gsize size = 0;
        const gconstpointer bytes = g_variant_get_fixed_array(each.get(), &size, 1);
        std::array<char, INET6_ADDRSTRLEN> text = {};
        if (size == sizeof(in6_addr) && ::inet_ntop(AF_INET6, bytes, text.data(), text.size())) {
            servers.emplace_back(text.data());
        }
    }
}

class Connection final : public platform::NetworkStateConnection {
  public:
    Connection(std::shared_ptr<NetworkManagerBus> bus, platform::NetworkStateStore& kernel,
               std::string clientName)
        : _bus(std::move(bus)),
          _kernelStore(kernel),
          _clientName(std::move(clientName)) {}

    Value copyValue(const NetworkStateKey& key) override {
        const std::lock_guard lock(_mutex);
        Value value = _ownValue(key);
        return value ? value : _kernelValue(key);
    }

  private:
    Value _ownValue(const NetworkStateKey& key) {
        const bool isState = key.domain == NetworkDomain::State;
        if (key.scope == NetworkStateKey::Scope::Global && isState) {
            const VariantPointer path = _bus->property(NM_DBUS_PATH, NM_DBUS_INTERFACE, "PrimaryConnection");
            const bool isPath = path && g_variant_is_of_type(path.get(), G_VARIANT_TYPE_OBJECT_PATH);
            const std::string primary = isPath ? g_variant_get_string(path.get(), nullptr) : "/";
            if (primary == "/" || key.entity == NetworkEntity::Link) {
                return std::nullopt;
            }
            return key.entity == NetworkEntity::IPv4 ? _globalIPv4(primary) : _globalDNS(primary);
        }
        if (key.scope == NetworkStateKey::Scope::Service && key.entity != NetworkEntity::Link) {
            return isState ? _serviceState(key) : _serviceSetup(key);
        }
        return std::nullopt;
    }

    Value _kernelValue(const NetworkStateKey& key) {
        if (!_kernel) {
            _kernel = _kernelStore.open(_clientName);
        }
        return _kernel ? _kernel->copyValue(key) : std::nullopt;
    }

    NetworkManagerProperties _active(const std::string& path) const {
        return _bus->properties(path, NM_DBUS_INTERFACE_ACTIVE_CONNECTION);
    }
    NetworkManagerProperties _ipv4Of(const NetworkManagerProperties& active) const {
        return _bus->properties(active.path("Ip4Config"), NM_DBUS_INTERFACE_IP4_CONFIG);
    }
    NetworkManagerProperties _ipv6Of(const NetworkManagerProperties& active) const {
        return _bus->properties(active.path("Ip6Config"), NM_DBUS_INTERFACE_IP6_CONFIG);
    }

    Value _globalIPv4(const std::string& primary) {
        const NetworkManagerProperties active = _active(primary);
        _primaryID = active.text("Uuid");
        _primaryPath = primary;
        if (_primaryID.empty()) {
            return std::nullopt;
        }
        Dictionary value{{platform::kNetworkPrimaryService, _primaryID}};
        const std::string router = _ipv4Of(active).text("Gateway");
        if (!router.empty()) {
            value.emplace(platform::kNetworkRouter, router);
        }
        return value;
    }

    Value _globalDNS(const std::string& primary) const {
        const NetworkManagerProperties active = _active(primary);
        const NetworkManagerProperties ipv4 = _ipv4Of(active);
        const NetworkManagerProperties ipv6 = _ipv6Of(active);
        Array servers;
        addIPv4Servers(ipv4, servers);
        addIPv6Servers(ipv6, servers);
        if (servers.empty()) {
            return std::nullopt; // another program decides about the name servers
        }
        std::string domain;
        for (const NetworkManagerProperties* configuration : {&ipv4, &ipv6}) {
            for (const char* list : {"Domains", "Searches"}) {
                domain = domain.empty() ? configuration->first(list, "as") : domain;
            }
        }
        Dictionary value{{platform::kNetworkServerAddresses, std::move(servers)}};
        if (!domain.empty()) {
            value.emplace(platform::kNetworkDomainName, domain);
        }
        return value;
    }

    // The active connection of a profile; empty when it is not in use.
    std::string _activePath(const std::string& serviceID) const {
        if (serviceID == _primaryID && _active(_primaryPath).text("Uuid") == serviceID) {
            return _primaryPath;
        }
        const VariantPointer all = _bus->property(NM_DBUS_PATH, NM_DBUS_INTERFACE, "ActiveConnections");
        const bool isList = all && g_variant_is_of_type(all.get(), G_VARIANT_TYPE_OBJECT_PATH_ARRAY);
        for (gsize index = 0; isList && index < g_variant_n_children(all.get()); ++index) {
            const char* path = nullptr;
            g_variant_get_child(all.get(), index, "&o", &path);
            if (_active(path).text("Uuid") == serviceID) {
                return path;
            }
        }
        return "";
    }

    // NetworkManager's addresses have an order of their own; which one is first is the kernel's matter.
    Value _inKernelsOrder(Value value, const std::string& device) {
        const auto sorted = [](const Dictionary& values) {
            std::vector<std::string> texts;
            for (const PropertyList& each : *values.at(platform::kNetworkAddresses).array()) {
                texts.push_back(*each.string());
            }
            std::ranges::sort(texts);
            return texts;
        };
        Value ofKernel =
            _kernelValue(NetworkStateKey::service(NetworkDomain::State, device, NetworkEntity::IPv4));
        return ofKernel && sorted(*ofKernel) == sorted(*value) ? ofKernel : value;
    }

    Value _serviceState(const NetworkStateKey& key) {
        const std::string path = key.entity == NetworkEntity::IPv4 ? _activePath(key.identifier) : "";
        if (path.empty()) {
            return std::nullopt;
        }
        const NetworkManagerProperties active = _active(path);
        Value value = addressesOf(_ipv4Of(active));
        if (!value || value->at(platform::kNetworkAddresses).array()->size() == 1) {
            return value;
        }
        const NetworkManagerProperties device =
            _bus->properties(active.first("Devices", "ao"), NM_DBUS_INTERFACE_DEVICE);
        return _inKernelsOrder(std::move(value), device.text("IpInterface"));
    }

    Value _serviceSetup(const NetworkStateKey& key) const {
        const NetworkManagerReply found =
            _bus->call(NM_DBUS_PATH_SETTINGS, NM_DBUS_INTERFACE_SETTINGS, "GetConnectionByUuid",
                       g_variant_new("(s)", key.identifier.c_str()));
        if (!found) {
            return std::nullopt;
        }
        const char* path = nullptr;
        g_variant_get_child(found.value.get(), 0, "&o", &path);
        const NetworkManagerReply stored =
            _bus->call(path, NM_DBUS_INTERFACE_SETTINGS_CONNECTION, "GetSettings", nullptr);
        if (!stored) {
            return std::nullopt;
        }
        const VariantPointer settings(g_variant_get_child_value(stored.value.get(), 0));
        const network::Protocols protocols = readProtocols(settings.get());
        const auto protocol =
            protocols.find(key.entity == NetworkEntity::IPv4 ? platform::kNetworkProtocolIPv4
                                                             : platform::kNetworkProtocolDNS);
        return protocol == protocols.end() ? std::nullopt : protocol->second;
    }

    std::mutex _mutex;
    const std::shared_ptr<NetworkManagerBus> _bus;
    platform::NetworkStateStore& _kernelStore;
    const std::string _clientName;
    std::unique_ptr<platform::NetworkStateConnection> _kernel; // opened when it is first asked
    std::string _primaryID;                                    // as the global IPv4 entity gave it last
    std::string _primaryPath;                                  // its active connection
};

} // namespace

std::unique_ptr<platform::NetworkStateConnection>
NetworkManagerStateStore::open(const std::string& clientName) {
    auto bus = NetworkManagerBus::open();
    if (!bus) {
        return _kernel.open(clientName);
    }
    return std::make_unique<Connection>(std::move(bus), _kernel, clientName);
}

} // namespace welcomer::desktop
