#include "backends/desktop/network/NetworkManagerReport.h"

#include "backends/desktop/network/NetworkManagerBus.h"

namespace welcomer::desktop {

bool reportNetworkManager(platform::BackendReport& report) {
    constexpr Peer peer = kNetworkManager.within(kReportLimit);
    Bus bus(G_BUS_TYPE_SYSTEM, Bus::Sharing::Own);
    ErrorSlot error;
    const BusConnection connection = bus.connection(Deadline(peer.limit), error);
    if (!connection || !hasOwner(connection.get(), peer)) {
        report.reason = isTimeOut(error) ? "the system bus does not answer" : "NetworkManager does not run";
        report.advice = "start NetworkManager, where it is to have the network";
        return false;
    }
    report.backend = "NetworkManager";
    const VariantPointer version = readProperty(connection.get(), peer, "Version", error);
    if (!version) {
        report.reason = "NetworkManager runs, does not answer";
        report.advice = "start NetworkManager anew";
        return true;
    }
    const bool isText = g_variant_is_of_type(version.get(), G_VARIANT_TYPE_STRING) != FALSE;
    report.reason =
        "NetworkManager " + std::string(isText ? g_variant_get_string(version.get(), nullptr) : "") + " runs";
    return true;
}

} // namespace welcomer::desktop
