#include "backends/local/network/NetworkApplication.h"

#include "backends/local/network/DHCPClient.h"
#include "backends/local/network/KernelNetwork.h"
#include "backends/local/network/ResolverFile.h"
#include "backends/network/IPv4Text.h"
#include "platform/NetworkConfigStore.h"

#include <algorithm>
#include <cerrno>
#include <linux/capability.h>
#include <sys/syscall.h>
#include <unistd.h>
#include <vector>

namespace welcomer::local {

namespace {

using Dictionary = PropertyList::Dictionary;
using platform::kNetworkConfigInvalid;
using platform::kNetworkConfigSuccess;

// What is to be done, checked.
struct Plan {
    enum class Method { None, Static, Dynamic };
    Method method = Method::None;
    posix::KernelAddress address;
    std::optional<posix::IPv4Address> router;
    DHCPRequest request;
    std::vector<std::string> servers;
};

std::int32_t statusOf(int error) {
    if (error == EPERM || error == EACCES) {
        return platform::kNetworkConfigAccessDenied;
    }
    return error == 0 ? kNetworkConfigSuccess : platform::kNetworkConfigKernelRefused + error;
}

const PropertyList* valueIn(const Dictionary& values, const char* key) {
    const auto found = values.find(key);
    return found == values.end() ? nullptr : &found->second;
}

const std::string* textIn(const Dictionary& values, const char* key) {
    const PropertyList* value = valueIn(values, key);
    return value ? value->string() : nullptr;
}

// The first text of a list as an address.
std::optional<posix::IPv4Address> firstAddress(const Dictionary& values, const char* key) {
    const PropertyList* value = valueIn(values, key);
    const PropertyList::Array* list = value ? value->array() : nullptr;
    const std::string* text = list && !list->empty() ? list->front().string() : nullptr;
    return text ? network::parseIPv4(*text) : std::nullopt;
}

std::int32_t planStatic(const Dictionary& ipv4, Plan& plan) {
    const auto address = firstAddress(ipv4, platform::kNetworkAddresses);
    const auto mask = firstAddress(ipv4, platform::kNetworkSubnetMasks);
    const int length = network::prefixLengthOf(mask.value_or(0)).value_or(0);
    if (!address || *address == 0 || length == 0) {
        return kNetworkConfigInvalid;
    }
    plan.method = Plan::Method::Static;
    plan.address = {0, *address, length};
    const PropertyList* value = valueIn(ipv4, platform::kNetworkRouter);
    const std::string* router = value ? value->string() : nullptr;
    if (value && (!router || !router->empty())) {
        plan.router = router ? network::parseIPv4(*router) : std::nullopt;
        if (!plan.router) {
            return kNetworkConfigInvalid;
        }
    }
    return kNetworkConfigSuccess;
}

std::int32_t planMethod(const Dictionary& ipv4, Plan& plan) {
    const PropertyList* method = valueIn(ipv4, platform::kNetworkConfigMethod);
    if (!method || *method == PropertyList(platform::kNetworkMethodLinkLocal)) {
        return kNetworkConfigSuccess;
    }
    if (*method == PropertyList(platform::kNetworkMethodManual) ||
        *method == PropertyList(platform::kNetworkMethodInform)) {
        return planStatic(ipv4, plan);
    }
    if (*method != PropertyList(platform::kNetworkMethodDHCP) &&
        *method != PropertyList(platform::kNetworkMethodBootP)) {
        return platform::kNetworkConfigUnknownMethod;
    }
    plan.method = Plan::Method::Dynamic;
    if (const std::string* clientID = textIn(ipv4, platform::kNetworkDHCPClientID)) {
        plan.request.clientID = *clientID;
    }
    return kNetworkConfigSuccess;
}

std::int32_t planServers(const Dictionary& dns, Plan& plan) {
    const PropertyList* value = valueIn(dns, platform::kNetworkServerAddresses);
    if (!value) {
        return kNetworkConfigSuccess;
    }
    for (const PropertyList& each : value->array() ? *value->array() : PropertyList::Array()) {
        std::string server = each.string() ? *each.string() : std::string();
        server.erase(server.find_last_not_of(' ') + 1); // spaces may stand behind it
        if (!network::isAddress(server)) {
            return kNetworkConfigInvalid;
        }
        plan.servers.push_back(std::move(server));
    }
    return kNetworkConfigSuccess;
}

bool isOf(int linkIndex, const posix::KernelRoute& route) {
    return route.linkIndex == linkIndex;
}

// Removes the device's addresses and default routes but those to be kept.
int removeOthers(KernelNetwork& kernel, int linkIndex, const posix::KernelAddress* address,
                 const posix::KernelRoute* route) {
    int error = 0;
    for (const posix::KernelRoute& each : kernel.defaultRoutes()) {
        if (error == 0 && isOf(linkIndex, each) && (!route || each != *route)) {
            error = kernel.removeDefaultRoute(each);
        }
    }
    // With a network's first address its others may go, which is no error.
    for (const posix::KernelAddress& each : kernel.addressesOf(linkIndex)) {
        if (error == 0 && (!address || each != *address)) {
            error = kernel.removeAddress(each);
        }
    }
    return error;
}

std::int32_t applyStatic(KernelNetwork& kernel, const posix::KernelLink& link, const Plan& plan) {
    posix::KernelAddress address = plan.address;
    address.linkIndex = link.index;
    const std::vector<posix::KernelAddress> before = kernel.addressesOf(link.index);
    const bool wasThere = std::ranges::count(before, address) > 0;
    const posix::KernelRoute route{link.index, plan.router, 0};
    int error = kernel.setUp(link.index, true);
    if (error == 0 && !wasThere) {
        error = kernel.addAddress(address);
    }
    if (error == 0 && plan.router) {
        error = kernel.addDefaultRoute(route);
        if (error != 0 && !wasThere) {
            kernel.removeAddress(address);
        }
    }
    if (error == 0) {
        error = removeOthers(kernel, link.index, &address, plan.router ? &route : nullptr);
    }
    const bool isAlone = before.empty() || (wasThere && before.size() == 1);
    if (error == 0 && !isAlone) {
        // What was removed may have taken these along.
        error = kernel.addAddress(address);
        if (error == 0 && plan.router) {
            error = kernel.addDefaultRoute(route);
        }
    }
    return statusOf(error);
}

std::int32_t applyDynamic(const posix::RootFolder& root, KernelNetwork& kernel, const posix::KernelLink& link,
                          const Plan& plan) {
    const DHCPClient client(root);
    if (!client.isInstalled()) {
        return platform::kNetworkConfigNoDHCPClient;
    }
    int error = kernel.setUp(link.index, true);
    if (error == 0) {
        error = removeOthers(kernel, link.index, nullptr, nullptr);
    }
    if (error != 0) {
        return statusOf(error);
    }
    DHCPRequest request = plan.request;
    request.device = link.name;
    request.servers = plan.servers;
    return client.start(request);
}

} // namespace

bool mayChangeNetwork() {
    __user_cap_header_struct header = {};
    header.version = _LINUX_CAPABILITY_VERSION_3;
    __user_cap_data_struct data[_LINUX_CAPABILITY_U32S_3] = {};
    return ::syscall(SYS_capget, &header, data) == 0 &&
           (data[CAP_TO_INDEX(CAP_NET_ADMIN)].effective & CAP_TO_MASK(CAP_NET_ADMIN)) != 0;
}

std::int32_t applyNetworkConfiguration(const posix::RootFolder& root, const std::string& device,
                                       const std::optional<Dictionary>& ipv4,
                                       const std::optional<Dictionary>& dns, std::string& detail) {
    detail = device;
    Plan plan;
    std::int32_t status = ipv4 ? planMethod(*ipv4, plan) : kNetworkConfigSuccess;
    if (status == kNetworkConfigSuccess && dns) {
        status = planServers(*dns, plan);
    }
    if (status != kNetworkConfigSuccess) {
        return status;
    }
    if (plan.method != Plan::Method::None) {
        KernelNetwork kernel;
        const auto link = kernel.linkNamed(device);
        if (!link) {
            return platform::kNetworkConfigNoDevice;
        }
        if (plan.method == Plan::Method::Static) {
            DHCPClient(root).stop(device);
            status = applyStatic(kernel, *link, plan);
        } else {
            status = applyDynamic(root, kernel, *link, plan);
        }
    }
    if (status == kNetworkConfigSuccess && !plan.servers.empty()) {
        status = ResolverFile(root).writeServers(plan.servers, detail);
    }
    return status;
}

} // namespace welcomer::local
