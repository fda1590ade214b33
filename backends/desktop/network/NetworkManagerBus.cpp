#include "backends/desktop/network/NetworkManagerBus.h"

#include "platform/NetworkConfigStore.h"

#include <string_view>
#include <utility>

namespace welcomer::desktop {

namespace {

// How long the bus may take to be connected to, and to tell whether NetworkManager is there.
constexpr Peer kLook = kNetworkManager.within(kReportLimit);

} // namespace

std::int32_t NetworkManagerReply::status(std::int32_t otherwise) const {
    const std::string_view name = errorName;
    const std::string_view last = name.substr(name.rfind('.') + 1);
    if (last == "PermissionDenied" || last == "AccessDenied" || last == "NotPrivileged" ||
        last == "InteractiveAuthorizationRequired") {
        return platform::kNetworkConfigAccessDenied;
    }
    if (last == "UnknownObject" || last == "UnknownMethod" || last == "UnknownInterface") {
        return platform::kNetworkConfigNotFound;
    }
    // "InvalidConnection" is also what a profile is refused with that cannot be written.
    if (name.starts_with(NM_DBUS_INTERFACE_SETTINGS_CONNECTION ".") || last == "InvalidProperty" ||
        last == "InvalidSetting") {
        return platform::kNetworkConfigInvalid;
    }
    return otherwise;
}

std::shared_ptr<NetworkManagerBus> NetworkManagerBus::open() {
    static Bus bus(G_BUS_TYPE_SYSTEM, Bus::Sharing::Own);
    ErrorSlot error;
    BusConnection connection = bus.connection(Deadline(kLook.limit), error);
    return connection && hasOwner(connection.get(), kLook)
               ? std::make_shared<NetworkManagerBus>(std::move(connection))
               : nullptr;
}

NetworkManagerReply NetworkManagerBus::call(const char* path, const char* interface, const char* method,
                                            GVariant* arguments, std::chrono::milliseconds limit) const {
    ErrorSlot error;
    NetworkManagerReply reply;
    reply.value = desktop::call(connection(), kNetworkManager.at(path).as(interface).within(limit), method,
                                arguments, nullptr, error);
    if (error) {
        const TextPointer name(g_dbus_error_get_remote_error(error.get()));
        reply.errorName = name ? name.get() : "";
        reply.errorText = error.get()->message;
    }
    return reply;
}

VariantPointer NetworkManagerBus::property(const char* path, const char* interface, const char* name) const {
    ErrorSlot error;
    return readProperty(connection(), kNetworkManager.at(path).as(interface), name, error);
}

NetworkManagerProperties NetworkManagerBus::properties(const std::string& path, const char* interface) const {
    ErrorSlot error;
    return NetworkManagerProperties(
        path.empty() ? nullptr
                     : readProperties(connection(), kNetworkManager.at(path.c_str()).as(interface), error));
}

VariantPointer NetworkManagerProperties::value(const char* name, const char* type) const {
    return VariantPointer(_all ? g_variant_lookup_value(_all.get(), name, G_VARIANT_TYPE(type)) : nullptr);
}

std::string NetworkManagerProperties::text(const char* name) const {
    const VariantPointer found = value(name, "s");
    return found ? g_variant_get_string(found.get(), nullptr) : "";
}

std::string NetworkManagerProperties::path(const char* name) const {
    const VariantPointer found = value(name, "o");
    const std::string text = found ? g_variant_get_string(found.get(), nullptr) : "/";
    return text == "/" ? std::string() : text;
}

std::string NetworkManagerProperties::first(const char* name, const char* type) const {
    const VariantPointer list = value(name, type);
    if (!list || g_variant_n_children(list.get()) == 0) {
        return "";
    }
    const VariantPointer found(g_variant_get_child_value(list.get(), 0));
    return g_variant_get_string(found.get(), nullptr);
}

} // namespace welcomer::desktop
