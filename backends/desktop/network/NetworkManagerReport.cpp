#include "backends/desktop/network/NetworkManagerReport.h"

#include "backends/desktop/network/NetworkManagerBus.h"

#include <nm-dbus-interface.h>

namespace welcomer::desktop {

bool reportNetworkManager(platform::BackendReport& report) {
    const auto bus = NetworkManagerBus::open();
    if (!bus) {
        report.reason = "NetworkManager does not run";
        report.advice = "start NetworkManager, where it is to have the network";
        return false;
    }
    const std::string version = bus->properties(NM_DBUS_PATH, NM_DBUS_INTERFACE).text("Version");
    report.backend = "NetworkManager";
    report.reason = "NetworkManager " + version + " runs";
    return true;
}

} // namespace welcomer::desktop
