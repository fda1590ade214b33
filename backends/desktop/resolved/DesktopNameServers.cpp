#include "backends/desktop/resolved/DesktopNameServers.h"

#include "platform/NetworkConfigStore.h"

namespace welcomer::desktop {

std::int32_t DesktopNameServers::setServers(const std::string& device,
                                            const std::vector<std::string>& servers, std::string& detail) {
    network::NameServerService* const service = _module.service();
    return service ? service->setServers(device, servers, detail)
                   : platform::kNetworkConfigNameServersElsewhere;
}

} // namespace welcomer::desktop
