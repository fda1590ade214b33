#include "backends/desktop/BusName.h"

#include "backends/desktop/GLibPointer.h"

namespace welcomer::desktop {

namespace {

constexpr char kBus[] = "org.freedesktop.DBus";

VariantPointer askBus(GDBusConnection* bus, const char* method, GVariant* arguments, const char* type,
                      int milliseconds) {
    return VariantPointer(g_dbus_connection_call_sync(bus, kBus, "/org/freedesktop/DBus", kBus, method,
                                                      arguments, G_VARIANT_TYPE(type), G_DBUS_CALL_FLAGS_NONE,
                                                      milliseconds, nullptr, nullptr));
}

} // namespace

BusName lookAtBusName(GDBusConnection* bus, const char* name, int milliseconds) {
    const VariantPointer owned = askBus(bus, "NameHasOwner", g_variant_new("(s)", name), "(b)", milliseconds);
    if (!owned) {
        return BusName::Unknown;
    }
    gboolean isOwned = FALSE;
    g_variant_get(owned.get(), "(b)", &isOwned);
    if (isOwned != FALSE) {
        return BusName::Owned;
    }
    const VariantPointer startable = askBus(bus, "ListActivatableNames", nullptr, "(as)", milliseconds);
    if (!startable) {
        return BusName::Unknown;
    }
    const VariantPointer list(g_variant_get_child_value(startable.get(), 0));
    const std::unique_ptr<const char*, GLibDelete<g_free>> names(g_variant_get_strv(list.get(), nullptr));
    return g_strv_contains(names.get(), name) != FALSE ? BusName::Startable : BusName::Nobody;
}

} // namespace welcomer::desktop
