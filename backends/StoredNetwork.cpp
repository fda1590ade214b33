#include "backends/StoredNetwork.h"

#include "backends/local/network/StoredNetwork.h"
#include "platform/NetworkConfigStore.h"
#ifdef WELCOMER_DESKTOP
#include "backends/desktop/resolved/DesktopNameServers.h"
#endif

#include <chrono>

namespace welcomer {

std::vector<std::string> restoreStoredNetwork(const std::string& root) {
    network::NameServerService* nameServers = nullptr;
#ifdef WELCOMER_DESKTOP
    desktop::DesktopNameServers resolved;
    nameServers = &resolved;
#endif
    std::vector<std::string> failures;
    for (const local::RestoredService& service :
         local::restoreStoredNetwork(posix::RootFolder(root), nameServers, std::chrono::seconds(10))) {
        if (!service.outcome) {
            const std::string text = platform::networkConfigStatusText(service.outcome.status);
            const std::string& detail = service.outcome.detail;
            failures.push_back(service.device + ": " + text +
                               (detail.empty() || detail == service.device ? "" : " (" + detail + ")"));
        }
    }
    return failures;
}

} // namespace welcomer
