#include "backends/desktop/network/NetworkManagerBus.h"

#include "platform/NetworkConfigStore.h"

#include <nm-dbus-interface.h>

#include <mutex>
#include <string_view>
#include <utility>

namespace welcomer::desktop {

namespace {

constexpr char kBusName[] = "org.freedesktop.DBus";
constexpr char kBusPath[] = "/org/freedesktop/DBus";
constexpr char kPropertiesInterface[] = "org.freedesktop.DBus.Properties";

ObjectPointer<GDBusConnection> connect() {
    const TextPointer address(g_dbus_address_get_for_bus_sync(G_BUS_TYPE_SYSTEM, nullptr, nullptr));
    if (!address) {
        return nullptr;
    }
    const auto flags = static_cast<GDBusConnectionFlags>(G_DBUS_CONNECTION_FLAGS_AUTHENTICATION_CLIENT |
                                                         G_DBUS_CONNECTION_FLAGS_MESSAGE_BUS_CONNECTION);
    ObjectPointer<GDBusConnection> connection(
        g_dbus_connection_new_for_address_sync(address.get(), flags, nullptr, nullptr, nullptr));
    if (connection) {
        g_dbus_connection_set_exit_on_close(connection.get(), FALSE);
    }
    return connection;
}

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
    static std::mutex mutex;
    static std::shared_ptr<NetworkManagerBus> kept;
    const std::lock_guard lock(mutex);
    if (!kept || g_dbus_connection_is_closed(kept->connection())) {
        auto connection = connect();
        kept = connection ? std::make_shared<NetworkManagerBus>(std::move(connection)) : nullptr;
    }
    return kept && kept->_isServed() ? kept : nullptr;
}

bool NetworkManagerBus::_isServed() const {
    const VariantPointer reply(g_dbus_connection_call_sync(
        connection(), kBusName, kBusPath, kBusName, "NameHasOwner", g_variant_new("(s)", NM_DBUS_SERVICE),
        G_VARIANT_TYPE("(b)"), G_DBUS_CALL_FLAGS_NO_AUTO_START, -1, nullptr, nullptr));
    gboolean isOwned = FALSE;
    if (reply) {
        g_variant_get(reply.get(), "(b)", &isOwned);
    }
    return isOwned != FALSE;
}

NetworkManagerReply NetworkManagerBus::call(const char* path, const char* interface, const char* method,
                                            GVariant* arguments, std::chrono::milliseconds limit) const {
    GError* error = nullptr;
    NetworkManagerReply reply;
    reply.value.reset(g_dbus_connection_call_sync(connection(), NM_DBUS_SERVICE, path, interface, method,
                                                  arguments, nullptr, G_DBUS_CALL_FLAGS_NO_AUTO_START,
                                                  static_cast<int>(limit.count()), nullptr, &error));
    if (const ErrorPointer owned(error); owned) {
        const TextPointer name(g_dbus_error_get_remote_error(error));
        reply.errorName = name ? name.get() : "";
        reply.errorText = error->message;
    }
    return reply;
}

VariantPointer NetworkManagerBus::property(const char* path, const char* interface, const char* name) const {
    const NetworkManagerReply reply =
        call(path, kPropertiesInterface, "Get", g_variant_new("(ss)", interface, name));
    if (!reply || !g_variant_is_of_type(reply.value.get(), G_VARIANT_TYPE("(v)"))) {
        return nullptr;
    }
    GVariant* value = nullptr;
    g_variant_get(reply.value.get(), "(v)", &value);
    return VariantPointer(value);
}

NetworkManagerProperties NetworkManagerBus::properties(const std::string& path, const char* interface) const {
    const NetworkManagerReply reply =
        path.empty() ? NetworkManagerReply()
                     : call(path.c_str(), kPropertiesInterface, "GetAll", g_variant_new("(s)", interface));
    const bool isKnown = reply && g_variant_is_of_type(reply.value.get(), G_VARIANT_TYPE("(a{sv})"));
    return NetworkManagerProperties(
        VariantPointer(isKnown ? g_variant_get_child_value(reply.value.get(), 0) : nullptr));
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
