#include "backends/desktop/network/NetworkManagerReport.h"

#include "backends/desktop/network/NetworkManagerBus.h"

#include <nm-dbus-interface.h>

namespace welcomer::desktop {

namespace {

// What takes longer does not answer.
constexpr std::chrono::milliseconds kLimit{5'000};

} // namespace

bool reportNetworkManager(platform::BackendReport& report) {
    const auto bus = NetworkManagerBus::open();
    if (!bus) {
        report.reason = "NetworkManager does not run";
        report.advice = "start NetworkManager, where it is to have the network";
        return false;
    }
    report.backend = "NetworkManager";
    const NetworkManagerReply reply = bus->call(NM_DBUS_PATH, "org.freedesktop.DBus.Properties", "Get",
                                                g_variant_new("(ss)", NM_DBUS_INTERFACE, "Version"), kLimit);
    if (!reply || !g_variant_is_of_type(reply.value.get(), G_VARIANT_TYPE("(v)"))) {
        report.reason = "NetworkManager runs, does not answer";
        report.advice = "start NetworkManager anew";
        return true;
    }
    const VariantPointer boxed(g_variant_get_child_value(reply.value.get(), 0));
    const VariantPointer version(g_variant_get_variant(boxed.get()));
    const bool isText = g_variant_is_of_type(version.get(), G_VARIANT_TYPE_STRING) != FALSE;
    report.reason =
        "NetworkManager " + std::string(isText ? g_variant_get_string(version.get(), nullptr) : "") + " runs";
    return true;
}

} // namespace welcomer::desktop
