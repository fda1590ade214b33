#include "backends/local/network/NetworkApplication.h"

#include "backends/local/network/KernelApplier.h"
#include "backends/network/IPv4Text.h"
#include "platform/NetworkConfigStore.h"

#include <linux/capability.h>
#include <sys/syscall.h>
#include <unistd.h>
#include <vector>

namespace welcomer::local {

namespace {

using Dictionary = PropertyList::Dictionary;
using platform::kNetworkConfigInvalid;
using platform::kNetworkConfigSuccess;

using Plan = network::IPv4Configuration;

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
    plan.method = Plan::Method::Manual;
    plan.address = *address;
    plan.prefixLength = length;
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
    plan.method = Plan::Method::DHCP;
    if (const std::string* clientID = textIn(ipv4, platform::kNetworkDHCPClientID)) {
        plan.clientID = *clientID;
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
                                       const std::optional<Dictionary>& dns, std::string& detail,
                                       NameServerService* nameServers) {
    detail = device;
    Plan plan;
    std::int32_t status = ipv4 ? planMethod(*ipv4, plan) : kNetworkConfigSuccess;
    if (status == kNetworkConfigSuccess && dns) {
        status = planServers(*dns, plan);
    }
    if (status != kNetworkConfigSuccess) {
        return status;
    }
    return KernelApplier(root, nameServers).apply(plan, device, detail);
}

} // namespace welcomer::local
