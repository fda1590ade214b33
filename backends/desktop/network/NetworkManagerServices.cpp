#include "backends/desktop/network/NetworkManagerServices.h"

#include "backends/desktop/network/NetworkManagerDevices.h"
#include "backends/desktop/network/NetworkManagerProfile.h"

#include <algorithm>
#include <array>
#include <set>
#include <string_view>
#include <tuple>
#include <utility>

namespace welcomer::desktop {

namespace {

using network::ChangedService;
using network::Outcome;
using network::StoredService;
using Interfaces = std::vector<std::shared_ptr<platform::NetworkInterface>>;

constexpr guint32 kToDisk = 1; // the same bit for adding and for updating

// Reading

// An interface of a device that the machine does not have now.
class AbsentInterface final : public platform::NetworkInterface {
  public:
    AbsentInterface(std::string type, std::optional<std::string> device)
        : _type(std::move(type)),
          _device(std::move(device)) {}

    std::optional<std::string> type() const override { return _type; }
    std::optional<std::string> deviceName() const override { return _device; }
    std::optional<std::string> displayName() const override {
        return _device ? _type + " (" + *_device + ")" : _type;
    }
    platform::NetworkInterface* underlyingInterface() const override { return nullptr; }

  private:
    const std::string _type;
    const std::optional<std::string> _device;
};

// The interface of a device, or null.
std::shared_ptr<platform::NetworkInterface> interfaceOf(const Interfaces& interfaces,
                                                        const std::optional<std::string>& device) {
    const auto found = std::ranges::find_if(
        interfaces, [&](const auto& each) { return each && device && each->deviceName() == device; });
    return found == interfaces.end() ? nullptr : *found;
}

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
            const NMDeviceType type = nm_device_get_device_type(device);
            for (auto* const port : elements<NMDevice>(nm_device_get_ports(device))) {
                ports.insert(port);
                if (type == NM_DEVICE_TYPE_BRIDGE || type == NM_DEVICE_TYPE_BOND) {
                    takenOver.insert(orEmpty(nm_device_get_iface(port)));
                }
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
    std::set<std::string> takenOver;          // the names of those that are ports of a bridge or a bond
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

StoredService storedService(const Devices& devices, NMConnection* profile, const Interfaces& interfaces) {
    StoredService service;
    service.id = orEmpty(nm_connection_get_uuid(profile));
    service.name = orEmpty(nm_connection_get_id(profile));
    service.device = deviceOf(devices, profile);
    service.interface = interfaceOf(interfaces, service.device);
    if (!service.interface) {
        service.interface = std::make_shared<AbsentInterface>(
            interfaceType(orEmpty(nm_connection_get_connection_type(profile))), service.device);
    }
    const VariantPointer settings(
        g_variant_ref_sink(nm_connection_to_dbus(profile, NM_CONNECTION_SERIALIZE_NO_SECRETS)));
    service.protocols = readProtocols(settings.get());
    return service;
}

bool isWired(NMDevice* device) {
    const NMDeviceType type = nm_device_get_device_type(device);
    return type == NM_DEVICE_TYPE_ETHERNET || type == NM_DEVICE_TYPE_VETH;
}

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

StoredService newService(NMClient* client, const std::string& device, const Interfaces& interfaces) {
    StoredService service;
    service.id = uuidOf(device);
    if (nm_client_get_connection_by_uuid(client, service.id.c_str())) {
        const TextPointer another(nm_utils_uuid_generate()); // it has been given another device
        service.id = another.get();
    }
    service.device = device;
    service.interface = interfaceOf(interfaces, device);
    if (!service.interface) {
        service.interface = std::make_shared<AbsentInterface>(platform::kNetworkEthernet, device);
    }
    service.name = service.interface->displayName();
    service.protocols = network::defaultProtocols();
    service.isStored = false;
    return service;
}

// Storing

// A profile on its way to NetworkManager.
struct Draft {
    std::string path;      // empty for a new one, until it is stored
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

// Reads the profile of a service anew, or makes one for a service that has none yet; null with what failed.
ObjectPointer<NMConnection> takeProfile(const NetworkManagerBus& bus, const StoredService& service,
                                        Draft& draft, Outcome& outcome) {
    outcome = findProfile(bus, service.id, draft.path); // others may have stored it, or deleted it
    if (!outcome) {
        return nullptr;
    }
    if (draft.path.empty() && !service.isStored) {
        return ObjectPointer<NMConnection>(
            newWiredProfile(service.device.value_or(""), service.name.value_or(""), service.id));
    }
    if (draft.path.empty()) {
        outcome.status = platform::kNetworkConfigNotFound;
        return nullptr;
    }
    const NetworkManagerReply stored =
        bus.call(draft.path.c_str(), NM_DBUS_INTERFACE_SETTINGS_CONNECTION, "GetSettings", nullptr);
    if (!stored) {
        outcome.status = stored.status(platform::kNetworkConfigReadFailed);
        return nullptr;
    }
    draft.before.reset(g_variant_get_child_value(stored.value.get(), 0));
    ObjectPointer<NMConnection> profile(nm_simple_connection_new_from_dbus(draft.before.get(), nullptr));
    outcome.status = profile ? platform::kNetworkConfigSuccess : platform::kNetworkConfigReadFailed;
    return profile;
}

Outcome prepare(const NetworkManagerBus& bus, ChangedService& changed, Draft& draft) {
    StoredService& service = changed.service;
    Outcome outcome;
    const ObjectPointer<NMConnection> profile = takeProfile(bus, service, draft, outcome);
    if (!profile) {
        return outcome;
    }
    outcome = service.rebase(draft.before ? readProtocols(draft.before.get()) : network::defaultProtocols(),
                             changed.configuration);
    if (outcome && !service.changedTypes.empty()) {
        outcome.status = writeProtocols(profile.get(), service, changed.configuration);
    }
    if (!outcome) {
        return outcome;
    }
    if (service.isEnabled) {
        g_object_set(nm_connection_get_setting_connection(profile.get()), NM_SETTING_CONNECTION_AUTOCONNECT,
                     *service.isEnabled ? TRUE : FALSE, nullptr);
    }
    if (nm_connection_normalize(profile.get(), nullptr, nullptr, nullptr) == FALSE) {
        return {platform::kNetworkConfigInvalid};
    }
    draft.after.reset(g_variant_ref_sink(nm_connection_to_dbus(profile.get(), NM_CONNECTION_SERIALIZE_ALL)));
    return {};
}

Outcome store(const NetworkManagerBus& bus, Draft& draft) {
    const NetworkManagerReply reply =
        draft.before
            ? update(bus, draft.path, draft.after.get())
            : bus.call(NM_DBUS_PATH_SETTINGS, NM_DBUS_INTERFACE_SETTINGS, "AddConnection2",
                       g_variant_new("(@a{sa{sv}}u@a{sv})", draft.after.get(), kToDisk, noArguments()));
    if (!reply) {
        return {reply.status(platform::kNetworkConfigWriteFailed)};
    }
    if (!draft.before) {
        const char* path = nullptr;
        g_variant_get_child(reply.value.get(), 0, "&o", &path);
        draft.path = path;
    }
    return {};
}

void putBack(const NetworkManagerBus& bus, const Draft& draft) {
    static_cast<void>(draft.before ? update(bus, draft.path, draft.before.get())
                                   : bus.call(draft.path.c_str(), NM_DBUS_INTERFACE_SETTINGS_CONNECTION,
                                              "Delete", nullptr));
}

} // namespace

std::vector<StoredService> readServices(NetworkManagerClient& client, const Interfaces& interfaces) {
    const Devices devices(client.get());
    auto profiles = elements<NMRemoteConnection>(nm_client_get_connections(client.get()));
    std::erase_if(profiles, [](NMRemoteConnection* each) { return !isService(each); });
    std::ranges::sort(profiles, {}, [&](NMRemoteConnection* each) { return rankOf(devices, each); });
    std::vector<StoredService> services;
    for (NMRemoteConnection* const each : profiles) {
        StoredService service = storedService(devices, NM_CONNECTION(each), interfaces);
        if (!service.device || !devices.takenOver.contains(*service.device)) {
            services.push_back(std::move(service));
        }
    }
    for (NMDevice* const device : devices.managed) {
        const bool isFitted = std::ranges::any_of(profiles, [&](NMRemoteConnection* each) {
            return nm_device_connection_compatible(device, NM_CONNECTION(each), nullptr) != FALSE;
        });
        if (isWired(device) && !devices.ports.contains(device) && !isFitted) {
            services.push_back(newService(client.get(), nm_device_get_iface(device), interfaces));
        }
    }
    return services;
}

Outcome findProfile(const NetworkManagerBus& bus, const std::string& uuid, std::string& path) {
    const NetworkManagerReply found = bus.call(NM_DBUS_PATH_SETTINGS, NM_DBUS_INTERFACE_SETTINGS,
                                               "GetConnectionByUuid", g_variant_new("(s)", uuid.c_str()));
    path.clear();
    if (found) {
        const char* text = "";
        g_variant_get_child(found.value.get(), 0, "&o", &text);
        path = text;
    } else if (found.errorName != NM_DBUS_INTERFACE_SETTINGS ".InvalidConnection") {
        return {found.status(platform::kNetworkConfigReadFailed)};
    }
    return {};
}

Outcome storeServices(const NetworkManagerBus& bus, std::vector<ChangedService>& changed) {
    std::vector<Draft> drafts;
    for (ChangedService& each : changed) {
        if (Outcome outcome = prepare(bus, each, drafts.emplace_back()); !outcome) {
            return outcome;
        }
    }
    for (auto draft = drafts.begin(); draft != drafts.end(); ++draft) {
        if (Outcome outcome = store(bus, *draft); !outcome) {
            std::for_each(drafts.begin(), draft, [&](const Draft& each) { putBack(bus, each); });
            return outcome;
        }
    }
    return {};
}

} // namespace welcomer::desktop
