// Whether the network works.

#include "network/NetworkingManager.h"

#include "generated/WelcomerConfiguration.h"
#include "log/PCLogManager.h"
#include "network/NCUtils.h"
#include "platform/Path.h"
#include "platform/Platform.h"
#include "propertylist/Lookup.h"

#include <algorithm>
#include <iterator>
#include <vector>

namespace welcomer {

namespace {

using platform::NetworkDomain;
using platform::NetworkEntity;
using platform::NetworkStateKey;
using Text = NetworkingManager::Text;

constexpr char kLinkClientName[] = "FirstRun"; // another one than the settings are read with
constexpr std::ptrdiff_t kNodesWanted = 3;
constexpr char kDynamicFunction[] = "-[NetworkingManager hasUsableDynamicEthernetConfiguration]";
constexpr char kDirectoryFunction[] = "-[NetworkingManager dirServiceNodesExist]";

bool isDeviceLinkActive(const std::string& device) {
    const auto store = platform::current().networkStateStore.open(kLinkClientName);
    const auto link =
        store
            ? store->copyValue(NetworkStateKey::interface(NetworkDomain::State, device, NetworkEntity::Link))
            : std::nullopt;
    return link && isTrueIn(*link, platform::kNetworkActive);
}

std::vector<std::string> authenticationSubnodeNames() {
    const auto node =
        platform::current().directoryService.openNode(platform::kDirectoryAuthenticationSearchNode);
    return node ? node->subnodeNames() : std::vector<std::string>();
}

} // namespace

bool NetworkingManager::internetIsReachable() {
    const std::optional<std::uint32_t> flags =
        platform::current()
            .hostReachability.createTarget(std::string(configuration::kPublicWebHost))
            ->flags();
    constexpr std::uint32_t kMask = platform::kHostReachable | platform::kHostConnectionRequired;
    return flags && (*flags & kMask) == platform::kHostReachable;
}

bool NetworkingManager::isOnCorvidInternalNetwork() {
    const Text address = _currentDHCPAddress();
    return address && address->starts_with(configuration::kInternalAddressPrefix) &&
           platform::current().fileSystem.exists(platform::kInternalMarker);
}

std::optional<NetworkingManager::Services> NetworkingManager::servicesWithEthernetPluggedIn() {
    const auto set = _currentSet();
    std::optional<Services> services =
        NCUtils::servicesInSetWithHardwareKey(set.get(), platform::kNetworkEthernet);
    if (services) {
        std::erase_if(*services, [](const auto& service) {
            const platform::NetworkInterface* interface =
                NCUtils::interfaceInServiceWithType(service.get(), platform::kNetworkEthernet);
            const Text device = interface ? interface->deviceName() : std::nullopt;
            return !device || !isDeviceLinkActive(*device);
        });
    }
    return services;
}

bool NetworkingManager::isEthernetCablePluggedIn() {
    const std::optional<Services> services = servicesWithEthernetPluggedIn();
    return services && !services->empty();
}

bool NetworkingManager::hasUsableDynamicEthernetConfiguration() {
    const auto set = _currentSet();
    const auto service = NCUtils::serviceInSetWithHardwareKey(set.get(), platform::kNetworkEthernet);
    const auto protocol = service ? service->copyProtocol(platform::kNetworkProtocolIPv4) : nullptr;
    const auto configuration = protocol ? protocol->configuration() : std::nullopt;
    const Text method =
        configuration ? copyOf(textIn(*configuration, platform::kNetworkConfigMethod)) : std::nullopt;
    if (!method) {
        return false;
    }
    WL_LOG_AS(kDynamicFunction, "NetworkingManager: hasUsableDynamicEthernetConfiguration: (configMethod %@)",
              *method);
    if (*method != platform::kNetworkMethodBootP && *method != platform::kNetworkMethodDHCP &&
        *method != platform::kNetworkMethodLinkLocal) {
        return false;
    }
    if (_currentDHCPAddress()) {
        return false;
    }
    const bool isReachable = internetIsReachable();
    if (isReachable) {
        WL_LOG_AS(kDynamicFunction, "hasUsableDynamicEthernetConfiguration: reg. host reachable.");
    } else {
        WL_LOG_AS(kDynamicFunction, "hasUsableDynamicEthernetConfiguration: reg. host *NOT* reachable.");
    }
    return isReachable;
}

bool NetworkingManager::dirServiceNodesExist() {
    platform::DirectoryService& directory = platform::current().directoryService;
    const std::vector<std::string> searchPath = authenticationSubnodeNames();
    WL_LOG_AS(kDirectoryFunction, "NetworkingManager: DirService: search paths: %@", searchPath);
    if (std::ranges::all_of(searchPath, [&](const auto& name) { return directory.isLocalNodeName(name); })) {
        return false;
    }
    const auto node = directory.openNode(platform::kDirectoryAuthenticationSearchNode);
    const std::vector<std::string> names = node ? node->subnodeNames() : std::vector<std::string>();
    if (std::ssize(names) < kNodesWanted) {
        return false;
    }
    const std::vector<std::string> unreachable = node->unreachableSubnodeNames();
    WL_LOG_AS(kDirectoryFunction, "NetworkingManager: DirService: subnodeNames %@", names);
    WL_LOG_AS(kDirectoryFunction, "NetworkingManager: DirService: unreachableSubnodeNames %@", unreachable);
    const std::ptrdiff_t reachable = std::ranges::count_if(
        names, [&](const auto& name) { return std::ranges::count(unreachable, name) == 0; });
    WL_LOG_AS(kDirectoryFunction, "NetworkingManager: DirService: reachableNodes %ld", reachable);
    return reachable >= kNodesWanted;
}

} // namespace welcomer
