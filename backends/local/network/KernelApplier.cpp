#include "backends/local/network/KernelApplier.h"

#include "backends/local/network/LinkSnapshot.h"
#include "backends/local/network/ResolverFile.h"
#include "platform/NetworkConfigStore.h"

#include <algorithm>
#include <cerrno>
#include <net/if.h>

namespace welcomer::local {

namespace {

using network::IPv4Configuration;
using platform::kNetworkConfigSuccess;

std::int32_t statusOf(int error) {
    if (error == EPERM || error == EACCES) {
        return platform::kNetworkConfigAccessDenied;
    }
    return error == 0 ? kNetworkConfigSuccess : platform::kNetworkConfigKernelRefused + error;
}

bool isOf(int linkIndex, const posix::KernelRoute& route) {
    return route.linkIndex == linkIndex && !route.isShared;
}

// The lowest metric that no other link's default route has.
std::uint32_t freeMetric(const std::vector<posix::KernelRoute>& routes, int linkIndex) {
    std::uint32_t metric = 0;
    while (std::ranges::any_of(routes, [&](const posix::KernelRoute& each) {
        return !isOf(linkIndex, each) && each.metric == metric;
    })) {
        ++metric;
    }
    return metric;
}

} // namespace

std::int32_t KernelApplier::apply(const IPv4Configuration& configuration, const std::string& device,
                                  std::string& detail) {
    using Method = IPv4Configuration::Method;
    detail = device;
    if (configuration.method == Method::Unset || configuration.method == Method::LinkLocal) {
        return _setServers(configuration.servers, device, detail);
    }
    const auto link = _kernel.linkNamed(device);
    if (!link) {
        return platform::kNetworkConfigNoDevice;
    }
    LinkSnapshot before(_kernel.socket(), link->index, (link->flags & IFF_UP) != 0);
    if (const int error = before.take()) {
        return statusOf(error);
    }
    const std::int32_t status = _applyToLink(configuration, *link, detail);
    if (status != kNetworkConfigSuccess) {
        before.restore();
    } else if (configuration.hasAddress()) {
        _client.stop(device); // only now: until here it keeps up what is to be there after a failure
    }
    return status;
}

std::int32_t KernelApplier::_applyToLink(const IPv4Configuration& configuration,
                                         const posix::KernelLink& link, std::string& detail) {
    std::int32_t status = statusOf(_kernel.setUp(link.index, true));
    if (status == kNetworkConfigSuccess) {
        status = configuration.hasAddress() ? statusOf(_setAddress(configuration, link.index))
                                            : _startClient(configuration, link);
    }
    if (status == kNetworkConfigSuccess) {
        status = _setServers(configuration.servers, link.name, detail);
        if (status != kNetworkConfigSuccess && !configuration.hasAddress()) {
            _client.stop(link.name);
        }
    }
    return status;
}

int KernelApplier::_setAddress(const IPv4Configuration& configuration, int linkIndex) {
    const posix::KernelAddress address{linkIndex, configuration.address,
                                       configuration.prefixLength.value_or(32)};
    std::optional<posix::KernelRoute> route;
    if (configuration.router) {
        std::vector<posix::KernelRoute> routes;
        if (const int error = _kernel.listDefaultRoutes(routes)) {
            return error;
        }
        route = posix::KernelRoute{linkIndex, configuration.router, freeMetric(routes, linkIndex)};
    }
    const auto add = [&] {
        const int error = _kernel.addAddress(address);
        return error == 0 && route ? _kernel.addDefaultRoute(*route) : error;
    };
    int error = add();
    bool isRemoved = false;
    if (error == 0) {
        error = _removeOthers(linkIndex, address, route, isRemoved);
    }
    return error == 0 && isRemoved ? add() : error; // what was removed may have taken these along
}

std::int32_t KernelApplier::_startClient(const IPv4Configuration& configuration,
                                         const posix::KernelLink& link) {
    if (!_client.isInstalled()) {
        return platform::kNetworkConfigNoDHCPClient;
    }
    bool isRemoved = false;
    if (const int error = _removeOthers(link.index, std::nullopt, std::nullopt, isRemoved)) {
        return statusOf(error);
    }
    DHCPRequest request{link.name, std::nullopt, configuration.servers};
    if (!configuration.clientID.empty()) {
        request.clientID = configuration.clientID;
    }
    return _client.start(request);
}

// Removes the link's addresses and default routes but those to be kept.
//  isRemoved  receives whether an address was removed, which may take other things along
int KernelApplier::_removeOthers(int linkIndex, const std::optional<posix::KernelAddress>& address,
                                 const std::optional<posix::KernelRoute>& route, bool& isRemoved) {
    std::vector<posix::KernelRoute> routes;
    int error = _kernel.listDefaultRoutes(routes);
    for (const posix::KernelRoute& each : routes) {
        if (error == 0 && isOf(linkIndex, each) && each != route) {
            error = _kernel.removeDefaultRoute(each);
        }
    }
    std::vector<posix::KernelAddress> addresses;
    error = error == 0 ? _kernel.listAddresses(linkIndex, addresses) : error;
    // With a network's first address its others may go, which is no error.
    for (const posix::KernelAddress& each : addresses) {
        if (error == 0 && each != address) {
            error = _kernel.removeAddress(each);
            isRemoved = true;
        }
    }
    return error;
}

std::int32_t KernelApplier::_setServers(const std::vector<std::string>& servers, const std::string& device,
                                        std::string& detail) {
    if (servers.empty()) {
        return kNetworkConfigSuccess;
    }
    const ResolverFile file(_root);
    const std::int32_t status = file.writeServers(servers, detail);
    if (status == platform::kNetworkConfigNameServersElsewhere && _nameServers && file.isOfResolved()) {
        return _nameServers->setServers(device, servers, detail);
    }
    return status;
}

} // namespace welcomer::local
