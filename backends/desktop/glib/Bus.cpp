#include "backends/desktop/glib/Bus.h"

#include "backends/desktop/glib/AsyncCall.h"

#include <optional>

namespace welcomer::desktop {

namespace {

constexpr char kPropertiesInterface[] = "org.freedesktop.DBus.Properties";

// Whether somebody has a peer's name; none where the bus does not answer.
std::optional<bool> isOwned(GDBusConnection* bus, const Peer& peer) {
    ErrorSlot error;
    const VariantPointer answer =
        call(bus, kBusPeer.within(peer.limit), "NameHasOwner", g_variant_new("(s)", peer.name), "(b)", error);
    if (!answer) {
        return std::nullopt;
    }
    gboolean result = FALSE;
    g_variant_get(answer.get(), "(b)", &result);
    return result != FALSE;
}

} // namespace

BusConnection Bus::connection(const Deadline& deadline, ErrorSlot& error) {
    const std::lock_guard lock(_mutex);
    if (_kept && g_dbus_connection_is_closed(_kept.get()) != FALSE) {
        _kept.reset();
    }
    if (!_kept) {
        _kept = _connect(deadline, error);
    }
    return BusConnection(_kept ? static_cast<GDBusConnection*>(g_object_ref(_kept.get())) : nullptr);
}

BusConnection Bus::_connect(const Deadline& deadline, ErrorSlot& error) const {
    AsyncCall connecting(deadline.left());
    BusConnection made;
    if (_sharing == Sharing::WithLibraries) {
        g_bus_get(_type, connecting.cancellable(), AsyncCall::done, connecting.argument());
        GAsyncResult* const result = connecting.wait();
        made.reset(result ? g_bus_get_finish(result, error.out()) : nullptr);
    } else {
        const TextPointer address(g_dbus_address_get_for_bus_sync(_type, nullptr, error.out()));
        if (!address) {
            return nullptr;
        }
        g_dbus_connection_new_for_address(
            address.get(),
            static_cast<GDBusConnectionFlags>(G_DBUS_CONNECTION_FLAGS_AUTHENTICATION_CLIENT |
                                              G_DBUS_CONNECTION_FLAGS_MESSAGE_BUS_CONNECTION),
            nullptr, connecting.cancellable(), AsyncCall::done, connecting.argument());
        GAsyncResult* const result = connecting.wait();
        made.reset(result ? g_dbus_connection_new_for_address_finish(result, error.out()) : nullptr);
    }
    if (made) {
        g_dbus_connection_set_exit_on_close(made.get(), FALSE);
    } else if (connecting.wasGivenUp()) {
        g_set_error_literal(error.out(), G_IO_ERROR, G_IO_ERROR_TIMED_OUT, "the bus does not answer");
    }
    return made;
}

VariantPointer call(GDBusConnection* bus, const Peer& peer, const char* method, GVariant* arguments,
                    const char* type, ErrorSlot& error) {
    const VariantPointer owned(arguments ? g_variant_ref_sink(arguments) : nullptr);
    const int limit = wholeMilliseconds(peer.limit);
    if (limit == 0) { // which would be a limit of the library's own
        g_set_error_literal(error.out(), G_IO_ERROR, G_IO_ERROR_TIMED_OUT, "the time is up");
        return nullptr;
    }
    return VariantPointer(g_dbus_connection_call_sync(
        bus, peer.name, peer.path, peer.interface, method, owned.get(), type ? G_VARIANT_TYPE(type) : nullptr,
        G_DBUS_CALL_FLAGS_NO_AUTO_START, limit, nullptr, error.out()));
}

VariantPointer readProperty(GDBusConnection* bus, const Peer& peer, const char* name, ErrorSlot& error) {
    const VariantPointer answer = call(bus, peer.as(kPropertiesInterface), "Get",
                                       g_variant_new("(ss)", peer.interface, name), "(v)", error);
    if (!answer) {
        return nullptr;
    }
    GVariant* value = nullptr;
    g_variant_get(answer.get(), "(v)", &value);
    return VariantPointer(value);
}

VariantPointer readProperties(GDBusConnection* bus, const Peer& peer, ErrorSlot& error) {
    const VariantPointer answer = call(bus, peer.as(kPropertiesInterface), "GetAll",
                                       g_variant_new("(s)", peer.interface), "(a{sv})", error);
    return VariantPointer(answer ? g_variant_get_child_value(answer.get(), 0) : nullptr);
}

bool writeProperty(GDBusConnection* bus, const Peer& peer, const char* name, GVariant* value,
                   ErrorSlot& error) {
    return call(bus, peer.as(kPropertiesInterface), "Set",
                g_variant_new("(ssv)", peer.interface, name, value), nullptr, error) != nullptr;
}

BusName lookAtName(GDBusConnection* bus, const Peer& peer) {
    const std::optional<bool> owned = isOwned(bus, peer);
    if (!owned || *owned) {
        return owned ? BusName::Owned : BusName::Unknown;
    }
    ErrorSlot error;
    const VariantPointer startable =
        call(bus, kBusPeer.within(peer.limit), "ListActivatableNames", nullptr, "(as)", error);
    if (!startable) {
        return BusName::Unknown;
    }
    const VariantPointer list(g_variant_get_child_value(startable.get(), 0));
    const std::unique_ptr<const char*, GLibDelete<g_free>> names(g_variant_get_strv(list.get(), nullptr));
    return g_strv_contains(names.get(), peer.name) != FALSE ? BusName::Startable : BusName::Nobody;
}

bool hasOwner(GDBusConnection* bus, const Peer& peer) {
    return isOwned(bus, peer).value_or(false);
}

bool isTimeOut(const ErrorSlot& error) {
    return g_error_matches(error.get(), G_IO_ERROR, G_IO_ERROR_TIMED_OUT) != FALSE;
}

} // namespace welcomer::desktop
