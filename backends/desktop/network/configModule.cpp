#include "backends/desktop/ModuleEntry.h"
#include "backends/desktop/NetworkModule.h"
#include "backends/desktop/network/NetworkManagerConfigStore.h"
#include "backends/desktop/network/NetworkManagerReport.h"

namespace welcomer::desktop {

namespace {

std::unique_ptr<platform::NetworkConfigStore>
createNetworkConfig(platform::NetworkConfigStore* kernel, const NetworkConfigModule::Arguments& /*arguments*/,
                    std::string& /*whyNot*/) {
    return std::make_unique<NetworkManagerConfigStore>(*kernel);
}

bool describeNetworkConfig(const NetworkConfigModule::Arguments& /*arguments*/,
                           platform::BackendReport& report) {
    return reportNetworkManager(report);
}

} // namespace

} // namespace welcomer::desktop

WELCOMER_DESKTOP_MODULE(welcomer::desktop::NetworkConfigModule, welcomer::desktop::createNetworkConfig,
                        welcomer::desktop::describeNetworkConfig)
