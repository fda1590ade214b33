#include "backends/desktop/network/NetworkManagerServices.h"

#include "backends/desktop/network/NetworkManagerDevices.h"

#include <algorithm>
#include <array>
#include <iterator>
#include <set>
#include <string_view>
#include <tuple>
#include <utility>

namespace welcomer::desktop {

namespace {

using platform::kNetworkConfigSuccess;

constexpr guint32 kToDisk = 1; // the same bit for adding and for updating

// Reading

// The types of interfaces by the type of profile.
constexpr std::array<std::pair<std::string_view, const char*>, 7> kTypes = {
    {{NM_SETTING_WIRED_SETTING_NAME, platform::kNetworkEthernet},
     {NM_SETTING_WIRELESS_SETTING_NAME, platform::kNetworkWireless},
     {NM_SETTING_BRIDGE_SETTING_NAME, platform::kNetworkBridge},
     {NM_SETTING_BOND_SETTING_NAME, platform::kNetworkBond},
     {NM_SETTING_VLAN_SETTING_NAME, platform::kNetworkVLAN},
     {NM_SETTING_VETH_SETTING_NAME, platform::kNetworkEthernet},
     {NM_SETTING_PPPOE_SETTING_NAME, "PPPoE"}}};

std::string interfaceType(const std::string& profileType) {
    const auto* const found =
        std::ranges::find(kTypes, std::string_view(profileType), [](const auto& each) { return each.first; });
    return found == kTypes.end() ? "Other" : found->second;
}

bool isService(NMRemoteConnection* remote) {
    const auto flags = nm_remote_connection_get_flags(remote);
    NMSettingConnection* const setting = nm_connection_get_setting_connection(NM_CONNECTION(remote));
    return (flags & NM_SETTINGS_CONNECTION_FLAG_EXTERNAL) == 0 && setting &&
           !nm_setting_connection_get_master(setting) &&
           orEmpty(nm_setting_connection_get_connection_type(setting)) != "loopback";
}

struct Devices {
    explicit Devices(NMClient* client) : managed(elements<NMDevice>(nm_client_get_devices(client))) {
        for (NMDevice* const device : managed) {
            for (auto* const port : elements<NMDevice>(nm_device_get_ports(device))) {
                ports.insert(port);
            }
        }
        std::erase_if(managed, [&](NMDevice* device) {
            return nm_device_get_state(device) <= NM_DEVICE_STATE_UNMANAGED || !nm_device_get_iface(device);
        });
        for (NMDevice* const device : managed) {
            if (const std::string uuid = runningProfile(device); !uuid.empty()) {
                running.emplace(uuid, device);
            }
        }
    }

    std::vector<NMDevice*> managed;
    std::set<NMDevice*> ports;
    std::map<std::string, NMDevice*> running; // by the ID of the profile
};

// The device that a profile is for: the one that runs it, the one it names, or one that it fits, first of all
// one that runs no other profile.
std::optional<std::string> deviceOf(const Devices& devices, NMConnection* profile) {
    const auto running = devices.running.find(nm_connection_get_uuid(profile));
    if (running != devices.running.end()) {
        return nm_device_get_iface(running->second);
    }
    if (const char* name = nm_connection_get_interface_name(profile)) {
        return name;
    }
    NMDevice* fitting = nullptr;
    for (NMDevice* const device : devices.managed) {
        if (nm_device_connection_compatible(device, profile, nullptr) != FALSE &&
            (!fitting || (!runningProfile(fitting).empty() && runningProfile(device).empty()))) {
            fitting = device;
        }
    }
    return fitting ? std::optional<std::string>(nm_device_get_iface(fitting)) : std::nullopt;
}

// Before others: what runs, what NetworkManager would rather choose, what was used last.
auto rankOf(const Devices& devices, NMRemoteConnection* remote) {
    NMSettingConnection* const setting = nm_connection_get_setting_connection(NM_CONNECTION(remote));
    return std::tuple(!devices.running.contains(nm_setting_connection_get_uuid(setting)),
                      -nm_setting_connection_get_autoconnect_priority(setting),
                      ~nm_setting_connection_get_timestamp(setting),
                      orEmpty(nm_setting_connection_get_id(setting)),
                      orEmpty(nm_setting_connection_get_uuid(setting)));
}

ServiceRecord recordOf(const Devices& devices, NMRemoteConnection* remote) {
    NMConnection* const profile = NM_CONNECTION(remote);
    ServiceRecord record;
    record.uuid = orEmpty(nm_connection_get_uuid(profile));
    record.name = orEmpty(nm_connection_get_id(profile));
    record.path = orEmpty(nm_connection_get_path(profile));
    record.device = deviceOf(devices, profile);
    record.type = interfaceType(orEmpty(nm_connection_get_connection_type(profile)));
    const VariantPointer settings(
        g_variant_ref_sink(nm_connection_to_dbus(profile, NM_CONNECTION_SERIALIZE_NO_SECRETS)));
    record.protocols = readProtocols(settings.get());
    return record;
}

bool isWired(NMDevice* device) {
    const NMDeviceType type = nm_device_get_device_type(device);
    return type == NM_DEVICE_TYPE_ETHERNET || type == NM_DEVICE_TYPE_VETH;
}

// What a profile of a device's own asks for.
const Protocols kNewProtocols = {
    {platform::kNetworkProtocolIPv4,
     PropertyList::Dictionary{{platform::kNetworkConfigMethod, platform::kNetworkMethodDHCP}}},
    {platform::kNetworkProtocolDNS, std::nullopt}};

// The ID of a device's own profile. It comes from the device's name, so that two who make a profile for a
// device at the same time make one.
std::string uuidOf(const std::string& device) {
    const std::string seed = "com.corvid.welcomer/" + device;
    const TextPointer checksum(g_compute_checksum_for_data(
        G_CHECKSUM_SHA1, reinterpret_cast<const guchar*>(seed.data()), seed.size()));
    std::string uuid = checksum.get();
    constexpr std::size_t kLength = 36;
    for (const std::size_t dash : {8U, 13U, 18U, 23U}) {
        uuid.insert(dash, 1, '-');
    }
    uuid[14] = '5'; // made from a name
    uuid[19] = 'a';
    return uuid.substr(0, kLength);
}

ServiceRecord newRecord(const std::string& device, const std::map<std::string, std::string>& names) {
    const auto name = names.find(device);
    ServiceRecord record;
    record.uuid = uuidOf(device);
    record.name = name == names.end() ? device : name->second;
    record.device = device;
    record.type = platform::kNetworkEthernet;
    record.protocols = kNewProtocols;
    return record;
}

// Storing

// A profile on its way to NetworkManager.
struct Draft {
    ServiceRecord* record = nullptr;
    VariantPointer before; // what is stored now; null for a new one
    VariantPointer after;
};

GVariant* noArguments() {
    return g_variant_new_array(G_VARIANT_TYPE("{sv}"), nullptr, 0);
}

NetworkManagerReply update(const NetworkManagerBus& bus, const std::string& path, GVariant* settings) {
    return bus.call(path.c_str(), NM_DBUS_INTERFACE_SETTINGS_CONNECTION, "Update2",
                    g_variant_new("(@a{sa{sv}}u@a{sv})", settings, kToDisk, noArguments()));
}

// The profile with an ID; empty when there is none.
std::string profilePath(const NetworkManagerBus& bus, const std::string& uuid) {
    const NetworkManagerReply found = bus.call(NM_DBUS_PATH_SETTINGS, NM_DBUS_INTERFACE_SETTINGS,
                                               "GetConnectionByUuid", g_variant_new("(s)", uuid.c_str()));
    const char* path = "";
    if (found) {
        g_variant_get_child(found.value.get(), 0, "&o", &path);
    }
    return path;
}

std::int32_t prepare(const NetworkManagerBus& bus, ServiceRecord& record, Draft& draft) {
    draft.record = &record;
    ObjectPointer<NMConnection> profile;
    if (record.path.empty()) {
        record.path = profilePath(bus, record.uuid); // somebody may have stored it since
    }
    if (record.path.empty()) {
        profile.reset(newWiredProfile(record.device.value_or(""), record.name, record.uuid));
    } else {
        const NetworkManagerReply stored =
            bus.call(record.path.c_str(), NM_DBUS_INTERFACE_SETTINGS_CONNECTION, "GetSettings", nullptr);
        if (!stored) {
            return stored.status(platform::kNetworkConfigReadFailed);
        }
        draft.before.reset(g_variant_get_child_value(stored.value.get(), 0));
        profile.reset(nm_simple_connection_new_from_dbus(draft.before.get(), nullptr));
    }
    if (!profile) {
        return platform::kNetworkConfigReadFailed;
    }
    Protocols protocols = draft.before ? readProtocols(draft.before.get()) : kNewProtocols;
    for (const auto& [type, configuration] : record.changedProtocols) {
        protocols[type] = configuration;
    }
    if (!record.changedProtocols.empty()) {
        const std::int32_t status = writeProtocols(profile.get(), protocols);
        if (status != kNetworkConfigSuccess) {
            return status;
        }
    }
    if (record.enabled) {
        g_object_set(nm_connection_get_setting_connection(profile.get()), NM_SETTING_CONNECTION_AUTOCONNECT,
                     *record.enabled ? TRUE : FALSE, nullptr);
    }
    if (nm_connection_normalize(profile.get(), nullptr, nullptr, nullptr) == FALSE) {
        return platform::kNetworkConfigInvalid;
    }
    draft.after.reset(g_variant_ref_sink(nm_connection_to_dbus(profile.get(), NM_CONNECTION_SERIALIZE_ALL)));
    return kNetworkConfigSuccess;
}

std::int32_t store(const NetworkManagerBus& bus, const Draft& draft) {
    ServiceRecord& record = *draft.record;
    if (draft.before) {
        const NetworkManagerReply reply = update(bus, record.path, draft.after.get());
        return reply ? kNetworkConfigSuccess : reply.status(platform::kNetworkConfigWriteFailed);
    }
    const NetworkManagerReply reply =
        bus.call(NM_DBUS_PATH_SETTINGS, NM_DBUS_INTERFACE_SETTINGS, "AddConnection2",
                 g_variant_new("(@a{sa{sv}}u@a{sv})", draft.after.get(), kToDisk, noArguments()));
    if (!reply) {
        return reply.status(platform::kNetworkConfigWriteFailed);
    }
    const char* path = nullptr;
    g_variant_get_child(reply.value.get(), 0, "&o", &path);
    record.path = path;
    return kNetworkConfigSuccess;
}

void putBack(const NetworkManagerBus& bus, const Draft& draft) {
    ServiceRecord& record = *draft.record;
    if (draft.before) {
        static_cast<void>(update(bus, record.path, draft.before.get()));
    } else {
        static_cast<void>(
            bus.call(record.path.c_str(), NM_DBUS_INTERFACE_SETTINGS_CONNECTION, "Delete", nullptr));
        record.path.clear();
    }
}

} // namespace

void ServiceRecord::forgetChanges() {
    changedProtocols.clear();
    enabled.reset();
    isEstablished = false;
}

std::vector<ServiceRecord> readServices(NetworkManagerClient& client,
                                        const std::map<std::string, std::string>& names) {
    const Devices devices(client.get());
    auto profiles = elements<NMRemoteConnection>(nm_client_get_connections(client.get()));
    std::erase_if(profiles, [](NMRemoteConnection* each) { return !isService(each); });
    std::ranges::sort(profiles, {}, [&](NMRemoteConnection* each) { return rankOf(devices, each); });
    std::vector<ServiceRecord> services;
    std::ranges::transform(profiles, std::back_inserter(services),
                           [&](NMRemoteConnection* each) { return recordOf(devices, each); });
    for (NMDevice* const device : devices.managed) {
        const bool isFitted = std::ranges::any_of(profiles, [&](NMRemoteConnection* each) {
            return nm_device_connection_compatible(device, NM_CONNECTION(each), nullptr) != FALSE;
        });
        if (isWired(device) && !devices.ports.contains(device) && !isFitted) {
            ServiceRecord record = newRecord(nm_device_get_iface(device), names);
            if (nm_client_get_connection_by_uuid(client.get(), record.uuid.c_str())) {
                const TextPointer another(nm_utils_uuid_generate()); // it has been given another device
                record.uuid = another.get();
            }
            services.push_back(std::move(record));
        }
    }
    return services;
}

std::int32_t storeServices(NetworkManagerClient& client, std::vector<ServiceRecord>& services) {
    std::vector<Draft> drafts;
    for (ServiceRecord& record : services) {
        if (record.isChanged()) {
            const std::int32_t status = prepare(client.bus(), record, drafts.emplace_back());
            if (status != kNetworkConfigSuccess) {
                return status;
            }
        }
    }
    for (auto draft = drafts.begin(); draft != drafts.end(); ++draft) {
        const std::int32_t status = store(client.bus(), *draft);
        if (status != kNetworkConfigSuccess) {
            std::for_each(drafts.begin(), draft, [&](const Draft& each) { putBack(client.bus(), each); });
            return status;
        }
    }
    for (const Draft& draft : drafts) {
        draft.record->forgetChanges();
    }
    return kNetworkConfigSuccess;
}

} // namespace welcomer::desktop
