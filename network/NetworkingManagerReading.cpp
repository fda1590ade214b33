// What the machine is configured to now.

#include "network/NetworkingManager.h"

#include "log/PCLogManager.h"
#include "network/NCUtils.h"
#include "platform/Platform.h"
#include "propertylist/Lookup.h"

#include <vector>

namespace welcomer {

namespace {

using platform::NetworkDomain;
using platform::NetworkEntity;
using platform::NetworkStateKey;
using Text = NetworkingManager::Text;
using TextList = NetworkingManager::TextList;
using Dictionary = PropertyList::Dictionary;

constexpr char kStateClientName[] = "Welcomer";
constexpr char kLinkLocalPrefix[] = "169.254.";
constexpr char kReadDefaultsFunction[] = "-[NetworkingManager _readDefaultConfiguration]";

// The first element of a list, where that is a text.
Text firstTextIn(const Dictionary& values, const char* key) {
    const PropertyList::Array* const list = arrayIn(values, key);
    const std::string* const text = list && !list->empty() ? list->front().string() : nullptr;
    return copyOf(text);
}

} // namespace

NetworkingManager::NetworkingManager() {
    _readDefaultConfiguration();
}

void NetworkingManager::_readDefaultConfiguration() {
    auto store = platform::current().networkStateStore.open(kStateClientName);
    if (!store) {
        WL_LOG_AS(kReadDefaultsFunction, "NetworkingManager: error connecting to dynamic store");
        return;
    }
    TextList dns;
    Text domain;
    if (const auto global =
            store->copyValue(NetworkStateKey::global(NetworkDomain::State, NetworkEntity::DNS))) {
        dns = textsIn(*global, platform::kNetworkServerAddresses);
        domain = copyOf(textIn(*global, platform::kNetworkDomainName));
    }
    Text router;
    Text method;
    Text address;
    Text mask;
    if (const auto global =
            store->copyValue(NetworkStateKey::global(NetworkDomain::State, NetworkEntity::IPv4))) {
        router = copyOf(textIn(*global, platform::kNetworkRouter));
        if (const Text primary = copyOf(textIn(*global, platform::kNetworkPrimaryService))) {
            if (const auto setup = store->copyValue(
                    NetworkStateKey::service(NetworkDomain::Setup, *primary, NetworkEntity::IPv4))) {
                method = copyOf(textIn(*setup, platform::kNetworkConfigMethod));
            }
            if (const auto state = store->copyValue(
                    NetworkStateKey::service(NetworkDomain::State, *primary, NetworkEntity::IPv4))) {
                address = firstTextIn(*state, platform::kNetworkAddresses);
                mask = firstTextIn(*state, platform::kNetworkSubnetMasks);
            }
        }
    }
    store.reset();
    if (address && !address->empty() && !address->starts_with(kLinkLocalPrefix)) {
        _defaultConfigurationMethod.set(method);
        _defaultIPAddress.set(address);
        _defaultSubnetMask.set(mask);
        _defaultRouter.set(router);
        _defaultDNS.set(dns);
        _defaultSearchDomains.set(domain ? std::vector{*domain} : std::vector<std::string>());
    }
    WL_LOG_AS(kReadDefaultsFunction, "--- WLCopyNetworkConfig ---");
    WL_LOG_AS(kReadDefaultsFunction, "IP: %@", address);
    WL_LOG_AS(kReadDefaultsFunction, "Mask: %@", mask);
    WL_LOG_AS(kReadDefaultsFunction, "Router: %@", router);
    if (dns) {
        WL_LOG_AS(kReadDefaultsFunction, "DNS: %@", dns->empty() ? std::nullopt : Text(dns->front()));
    }
    WL_LOG_AS(kReadDefaultsFunction, "Domain: %@", domain);
    WL_LOG_AS(kReadDefaultsFunction, "Config Method: %@", method);
}

Text NetworkingManager::_currentDHCPAddress() {
    const auto store = platform::current().networkStateStore.open(kStateClientName);
    if (!store) {
        return std::nullopt;
    }
    const auto global = store->copyValue(NetworkStateKey::global(NetworkDomain::State, NetworkEntity::IPv4));
    const Text primary = global ? copyOf(textIn(*global, platform::kNetworkPrimaryService)) : std::nullopt;
    if (!primary) {
        return std::nullopt;
    }
    // Read and dropped: the method does not matter.
    static_cast<void>(
        store->copyValue(NetworkStateKey::service(NetworkDomain::Setup, *primary, NetworkEntity::IPv4)));
    const auto state =
        store->copyValue(NetworkStateKey::service(NetworkDomain::State, *primary, NetworkEntity::IPv4));
    Text address = state ? firstTextIn(*state, platform::kNetworkAddresses) : std::nullopt;
    return address && address->empty() ? std::nullopt : address;
}

Text NetworkingManager::defaultIP4ConfigurationMethod() {
    const auto set = _currentSet();
    const auto service = NCUtils::serviceInSetWithHardwareKey(set.get(), _hardwareKey());
    const auto protocol = service ? service->copyProtocol(platform::kNetworkProtocolIPv4) : nullptr;
    const auto configuration = protocol ? protocol->configuration() : std::nullopt;
    return configuration ? copyOf(textIn(*configuration, platform::kNetworkConfigMethod)) : std::nullopt;
}

Text NetworkingManager::_hardwareKey() const {
    if (userSaidConfigureLAN()) {
        return platform::kNetworkEthernet;
    }
    static_cast<void>(userSaidConfigureWiFi()); // every other choice is wireless all the same
    return platform::kNetworkWireless;
}

} // namespace welcomer
