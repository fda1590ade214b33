#include "backends/local/network/LocalNetworkStateStore.h"

#include "backends/local/network/NetworkFile.h"
#include "backends/local/network/ResolverFile.h"
#include "backends/network/IPv4Text.h"
#include "backends/posix/KernelNetwork.h"
#include "platform/NetworkConfigStore.h"

#include <algorithm>
#include <mutex>

namespace welcomer::local {

namespace {

using platform::NetworkDomain;
using platform::NetworkEntity;
using platform::NetworkStateKey;
using Dictionary = PropertyList::Dictionary;
using Value = std::optional<Dictionary>;

class Connection final : public platform::NetworkStateConnection {
  public:
    explicit Connection(const posix::RootFolder& root) : _file(root), _resolver(root) {}

    Value copyValue(const NetworkStateKey& key) override {
        const std::lock_guard lock(_mutex);
        const bool isState = key.domain == NetworkDomain::State;
        switch (key.scope) {
        case NetworkStateKey::Scope::Global:
            if (!isState || key.entity == NetworkEntity::Link) {
                return std::nullopt;
            }
            return key.entity == NetworkEntity::IPv4 ? _globalIPv4() : _globalDNS();
        case NetworkStateKey::Scope::Service:
            if (!isState) {
                return _stored(key);
            }
            return key.entity == NetworkEntity::IPv4 ? _serviceIPv4(key.identifier) : std::nullopt;
        case NetworkStateKey::Scope::Interface:
            return isState && key.entity == NetworkEntity::Link ? _link(key.identifier) : std::nullopt;
        }
        return std::nullopt;
    }

  private:
    Value _globalIPv4() {
        std::vector<posix::KernelRoute> routes = _kernel.defaultRoutes();
        std::erase_if(routes, [](const posix::KernelRoute& each) { return !each.isUsable; });
        const auto best = std::ranges::min_element(routes, {}, &posix::KernelRoute::metric);
        const auto link = best == routes.end() ? std::nullopt : _kernel.linkNumbered(best->linkIndex);
        if (!link) {
            return std::nullopt;
        }
        Dictionary value{{platform::kNetworkPrimaryService,
                          networkfile::serviceOfDevice(_content(), link->name).value_or(link->name)}};
        if (best->gateway) {
            value.emplace(platform::kNetworkRouter, network::formatIPv4(*best->gateway));
        }
        return value;
    }

    Value _globalDNS() const {
        const ResolverConfiguration configuration = _resolver.read();
        Dictionary value;
        if (!configuration.servers.empty()) {
            value.emplace(platform::kNetworkServerAddresses,
                          PropertyList::Array(configuration.servers.begin(), configuration.servers.end()));
        }
        if (configuration.domain) {
            value.emplace(platform::kNetworkDomainName, *configuration.domain);
        }
        return value.empty() ? std::nullopt : Value(value);
    }

    Value _stored(const NetworkStateKey& key) {
        if (key.entity == NetworkEntity::Link) {
            return std::nullopt;
        }
        return networkfile::configuration(_content(), key.identifier,
                                          key.entity == NetworkEntity::IPv4 ? platform::kNetworkProtocolIPv4
                                                                            : platform::kNetworkProtocolDNS);
    }

    Value _serviceIPv4(const std::string& serviceID) {
        const std::string device =
            networkfile::serviceText(_content(), serviceID, "Device").value_or(serviceID);
        const auto link = _kernel.linkNamed(device);
        PropertyList::Array addresses;
        PropertyList::Array masks;
        for (const posix::KernelAddress& each :
             link ? _kernel.addressesOf(link->index) : std::vector<posix::KernelAddress>()) {
            addresses.emplace_back(network::formatIPv4(each.address));
            masks.emplace_back(network::formatIPv4(network::maskOf(each.prefixLength)));
        }
        if (addresses.empty()) {
            return std::nullopt;
        }
        return Dictionary{{platform::kNetworkAddresses, std::move(addresses)},
                          {platform::kNetworkSubnetMasks, std::move(masks)}};
    }

    Value _link(const std::string& device) {
        const auto link = _kernel.linkNamed(device);
        return link ? Value(Dictionary{{platform::kNetworkActive, link->isActive()}}) : std::nullopt;
    }

    // What is stored, read once: a connection is made for a few questions.
    const Dictionary& _content() {
        if (!_read) {
            _read = _file.read();
        }
        return *_read;
    }

    std::mutex _mutex;
    const NetworkFile _file;
    const ResolverFile _resolver;
    posix::KernelNetwork _kernel;
    Value _read;
};

} // namespace

std::unique_ptr<platform::NetworkStateConnection> LocalNetworkStateStore::open(const std::string&) {
    return std::make_unique<Connection>(_root);
}

} // namespace welcomer::local
