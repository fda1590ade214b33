#include "backends/desktop/network/NetworkManagerActivation.h"

#include "backends/desktop/network/NetworkManagerDevices.h"
#include "backends/desktop/network/NetworkManagerServices.h"
#include "backends/posix/KernelNetwork.h"

#include <algorithm>
#include <set>
#include <string>

namespace welcomer::desktop {

namespace {

using network::IPv4Configuration;
using network::Outcome;
using Method = IPv4Configuration::Method;

constexpr std::chrono::milliseconds kActivationLimit{90'000};

// A device's IPv4 addresses, as "192.0.2.7/24".
std::set<std::string> addressesOf(NMDevice* device) {
    std::set<std::string> addresses;
    NMIPConfig* const configuration = nm_device_get_ip4_config(device);
    for (auto* const each :
         elements<NMIPAddress>(configuration ? nm_ip_config_get_addresses(configuration) : nullptr)) {
        addresses.insert(orEmpty(nm_ip_address_get_address(each)) + "/" +
                         std::to_string(nm_ip_address_get_prefix(each)));
    }
    return addresses;
}

std::string routerOf(NMDevice* device) {
    NMIPConfig* const configuration = nm_device_get_ip4_config(device);
    return configuration ? orEmpty(nm_ip_config_get_gateway(configuration)) : "";
}

// The address that the network has lent a device; empty when there is none.
std::string leasedAddress(NMDevice* device) {
    NMDhcpConfig* const lease = nm_device_get_dhcp4_config(device);
    return lease ? orEmpty(nm_dhcp_config_get_one_option(lease, "ip_address")) : "";
}

// Whether a device has what is asked for, and no address of another configuration.
bool has(NMDevice* device, const IPv4Configuration& configuration) {
    std::set<std::string> addresses = addressesOf(device);
    const std::string wanted = network::formatIPv4(configuration.address) + "/" +
                               std::to_string(configuration.prefixLength.value_or(0));
    const std::string lent = leasedAddress(device) + "/";
    switch (configuration.method) {
    case Method::Manual:
        return addresses == std::set{wanted} &&
               routerOf(device) == (configuration.router ? network::formatIPv4(*configuration.router) : "");
    case Method::Inform:
        return addresses.contains(wanted);
    case Method::LinkLocal:
        return std::ranges::any_of(addresses, [](const auto& each) { return each.starts_with("169.254."); });
    case Method::Unset:
        return true;
    default:
        return std::ranges::all_of(addresses, [&](const auto& each) { return each.starts_with(lent); });
    }
}

// Whether a device has got as far with its profile as can be waited for.
bool isFarEnough(NMDevice* device, const IPv4Configuration& configuration) {
    const NMDeviceState state = nm_device_get_state(device);
    const bool asks = configuration.method == Method::DHCP || configuration.method == Method::BootP;
    return state == NM_DEVICE_STATE_ACTIVATED ||
           (asks && state >= NM_DEVICE_STATE_IP_CONFIG && state < NM_DEVICE_STATE_ACTIVATED);
}

// The answer to reapplying a profile that the device runs: NetworkManager gives it before it is done.
Outcome reapply(NetworkManagerClient& client, NMDevice* device, const std::string& name,
                const IPv4Configuration& configuration) {
    const NetworkManagerReply reply = client.bus().call(
        nm_object_get_path(NM_OBJECT(device)), NM_DBUS_INTERFACE_DEVICE, "Reapply",
        g_variant_new("(@a{sa{sv}}tu)", g_variant_new_array(G_VARIANT_TYPE("{sa{sv}}"), nullptr, 0),
                      guint64{0}, guint32{0}));
    if (!reply) {
        return {reply.status(platform::kNetworkConfigNotActivated)};
    }
    bool isGone = false;
    const bool isDone = client.waitUntil(
        [&] {
            NMDevice* const now = nm_client_get_device_by_iface(client.get(), name.c_str());
            isGone = !now || !isRunning(now);
            return isGone || (isFarEnough(now, configuration) && has(now, configuration));
        },
        kActivationLimit);
    return {isDone && !isGone ? platform::kNetworkConfigSuccess : platform::kNetworkConfigNotActivated};
}

NMActiveConnection* activeAt(NMClient* client, const std::string& path) {
    const auto all = elements<NMActiveConnection>(nm_client_get_active_connections(client));
    const auto found = std::ranges::find_if(
        all, [&](NMActiveConnection* each) { return path == nm_object_get_path(NM_OBJECT(each)); });
    return found == all.end() ? nullptr : *found;
}

Outcome activate(NetworkManagerClient& client, const network::StoredService& service,
                 const IPv4Configuration& configuration) {
    NMDevice* const device = nm_client_get_device_by_iface(client.get(), service.device->c_str());
    if (!device) {
        return {platform::kNetworkConfigNoDevice, *service.device};
    }
    std::string profile;
    if (Outcome outcome = findProfile(client.bus(), service.id, profile); !outcome || profile.empty()) {
        return outcome ? Outcome{platform::kNetworkConfigNotFound} : outcome;
    }
    const NetworkManagerReply reply = client.bus().call(
        NM_DBUS_PATH, NM_DBUS_INTERFACE, "ActivateConnection",
        g_variant_new("(ooo)", profile.c_str(), nm_object_get_path(NM_OBJECT(device)), "/"));
    if (!reply) {
        return {reply.status(platform::kNetworkConfigNotActivated)};
    }
    const char* path = nullptr;
    g_variant_get_child(reply.value.get(), 0, "&o", &path);
    const std::string activePath = path;
    client.refresh();
    bool isActive = false;
    client.waitUntil(
        [&] {
            NMActiveConnection* const active = activeAt(client.get(), activePath);
            const NMActiveConnectionState state =
                active ? nm_active_connection_get_state(active) : NM_ACTIVE_CONNECTION_STATE_DEACTIVATED;
            NMDevice* const now = nm_client_get_device_by_iface(client.get(), service.device->c_str());
            const bool isIts = now && active && nm_device_get_active_connection(now) == active;
            isActive = state == NM_ACTIVE_CONNECTION_STATE_ACTIVATED ||
                       (isIts && isFarEnough(now, configuration) && has(now, configuration));
            return isActive || state >= NM_ACTIVE_CONNECTION_STATE_DEACTIVATING;
        },
        kActivationLimit);
    return {isActive ? platform::kNetworkConfigSuccess : platform::kNetworkConfigNotActivated};
}

// Whether the kernel has the default route that a plan asks for. After addresses were changed from outside, a
// reapply now and then leaves it away for good, though NetworkManager reports the router: the profile is
// activated anew then.
bool hasRouteOf(const std::string& device, const IPv4Configuration& configuration) {
    if (configuration.method != Method::Manual || !configuration.router) {
        return true;
    }
    posix::KernelNetwork kernel;
    const auto link = kernel.linkNamed(device);
    return link && std::ranges::any_of(kernel.defaultRoutes(), [&](const posix::KernelRoute& route) {
               return route.linkIndex == link->index;
           });
}

} // namespace

Outcome activateService(NetworkManagerClient& client, const network::StoredService& service,
                        const IPv4Configuration& configuration) {
    client.refresh();
    NMDevice* const device =
        service.device ? nm_client_get_device_by_iface(client.get(), service.device->c_str()) : nullptr;
    if (!device) {
        return {platform::kNetworkConfigNoDevice, service.device.value_or(service.id)};
    }
    const bool isRunningIt = runningProfile(device) == service.id;
    const bool isReapplied = isRunningIt && reapply(client, device, *service.device, configuration) &&
                             hasRouteOf(*service.device, configuration);
    return isReapplied ? Outcome() : activate(client, service, configuration);
}

} // namespace welcomer::desktop
