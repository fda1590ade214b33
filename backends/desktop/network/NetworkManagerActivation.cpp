#include "backends/desktop/network/NetworkManagerActivation.h"

#include "backends/desktop/network/NetworkManagerDevices.h"
#include "backends/local/network/KernelNetwork.h"

#include <algorithm>
#include <utility>

namespace welcomer::desktop {

namespace {

using platform::kNetworkConfigSuccess;

constexpr std::chrono::milliseconds kActivationLimit{90'000};

using AddressList = std::vector<std::pair<std::string, unsigned>>;

AddressList addressesOf(NMDevice* device) {
    AddressList addresses;
    NMIPConfig* const configuration = nm_device_get_ip4_config(device);
    for (auto* const each :
         elements<NMIPAddress>(configuration ? nm_ip_config_get_addresses(configuration) : nullptr)) {
        addresses.emplace_back(nm_ip_address_get_address(each), nm_ip_address_get_prefix(each));
    }
    return addresses;
}

std::string routerOf(NMDevice* device) {
    NMIPConfig* const configuration = nm_device_get_ip4_config(device);
    return configuration ? orEmpty(nm_ip_config_get_gateway(configuration)) : "";
}

bool hasLease(NMDevice* device) {
    NMDhcpConfig* const lease = nm_device_get_dhcp4_config(device);
    return lease && nm_dhcp_config_get_one_option(lease, "ip_address");
}

// Whether a device has what a plan asks for.
bool has(NMDevice* device, const IPv4Plan& plan) {
    AddressList addresses = addressesOf(device);
    AddressList wanted = plan.addresses;
    std::ranges::sort(addresses);
    std::ranges::sort(wanted);
    switch (plan.method) {
    case IPv4Plan::Method::Manual:
        return addresses == wanted && routerOf(device) == plan.router;
    case IPv4Plan::Method::Automatic:
        return wanted.empty() ? hasLease(device) : std::ranges::includes(addresses, wanted);
    case IPv4Plan::Method::LinkLocal:
        return std::ranges::any_of(addresses,
                                   [](const auto& each) { return each.first.starts_with("169.254."); });
    default:
        return true;
    }
}

// The answer to reapplying a profile that the device runs: NetworkManager gives it before it is done.
std::int32_t reapply(NetworkManagerClient& client, NMDevice* device, const std::string& name,
                     const IPv4Plan& plan) {
    const NetworkManagerReply reply = client.bus().call(
        nm_object_get_path(NM_OBJECT(device)), NM_DBUS_INTERFACE_DEVICE, "Reapply",
        g_variant_new("(@a{sa{sv}}tu)", g_variant_new_array(G_VARIANT_TYPE("{sa{sv}}"), nullptr, 0),
                      guint64{0}, guint32{0}));
    if (!reply) {
        return reply.status(platform::kNetworkConfigNotActivated);
    }
    bool isGone = false;
    const bool isDone = client.waitUntil(
        [&] {
            NMDevice* const now = nm_client_get_device_by_iface(client.get(), name.c_str());
            isGone = !now || !isRunning(now);
            return isGone || (nm_device_get_state(now) == NM_DEVICE_STATE_ACTIVATED && has(now, plan));
        },
        kActivationLimit);
    return isDone && !isGone ? kNetworkConfigSuccess : platform::kNetworkConfigNotActivated;
}

NMActiveConnection* activeAt(NMClient* client, const std::string& path) {
    const auto all = elements<NMActiveConnection>(nm_client_get_active_connections(client));
    const auto found = std::ranges::find_if(
        all, [&](NMActiveConnection* each) { return path == nm_object_get_path(NM_OBJECT(each)); });
    return found == all.end() ? nullptr : *found;
}

std::int32_t activate(NetworkManagerClient& client, NMDevice* device, const std::string& profilePath) {
    const NetworkManagerReply reply = client.bus().call(
        NM_DBUS_PATH, NM_DBUS_INTERFACE, "ActivateConnection",
        g_variant_new("(ooo)", profilePath.c_str(), nm_object_get_path(NM_OBJECT(device)), "/"));
    if (!reply) {
        return reply.status(platform::kNetworkConfigNotActivated);
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
            isActive = state == NM_ACTIVE_CONNECTION_STATE_ACTIVATED;
            return isActive || state >= NM_ACTIVE_CONNECTION_STATE_DEACTIVATING;
        },
        kActivationLimit);
    return isActive ? kNetworkConfigSuccess : platform::kNetworkConfigNotActivated;
}

// Whether the kernel has the default route that a plan asks for. After addresses were changed from outside, a
// reapply now and then leaves it away for good, though NetworkManager reports the router: the profile is
// activated anew then.
bool hasRouteOf(const std::string& device, const IPv4Plan& plan) {
    if (plan.method != IPv4Plan::Method::Manual || plan.router.empty()) {
        return true;
    }
    local::KernelNetwork kernel;
    const auto link = kernel.linkNamed(device);
    return link && std::ranges::any_of(kernel.defaultRoutes(), [&](const posix::KernelRoute& route) {
               return route.linkIndex == link->index;
           });
}

} // namespace

std::int32_t activateService(NetworkManagerClient& client, const ServiceRecord& service) {
    IPv4Plan plan;
    DNSPlan servers;
    const std::int32_t status = planAll(service.protocols, plan, servers);
    if (status != kNetworkConfigSuccess) {
        return status;
    }
    client.refresh();
    NMDevice* const device =
        service.device ? nm_client_get_device_by_iface(client.get(), service.device->c_str()) : nullptr;
    if (!device) {
        return platform::kNetworkConfigNoDevice;
    }
    const bool isRunningIt = runningProfile(device) == service.uuid;
    if (isRunningIt && reapply(client, device, *service.device, plan) == kNetworkConfigSuccess &&
        hasRouteOf(*service.device, plan)) {
        return kNetworkConfigSuccess;
    }
    NMDevice* const now = nm_client_get_device_by_iface(client.get(), service.device->c_str());
    return now ? activate(client, now, service.path) : platform::kNetworkConfigNoDevice;
}

} // namespace welcomer::desktop
