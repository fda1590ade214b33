#include "backends/desktop/ModuleEntry.h"
#include "backends/desktop/resolved/ResolvedModule.h"
#include "backends/desktop/resolved/ResolvedNameServers.h"

namespace welcomer::desktop {

namespace {

std::unique_ptr<network::NameServerService> createNameServers(network::NameServerService* /*local*/,
                                                              const ResolvedModule::Arguments& /*arguments*/,
                                                              std::string& /*whyNot*/) {
    return std::make_unique<ResolvedNameServers>();
}

bool describeNameServers(const ResolvedModule::Arguments& /*arguments*/, platform::BackendReport& report) {
    const bool isRunning = isResolvedRunning(report.reason);
    if (isRunning) {
        report.backend = "systemd-resolved";
    }
    return isRunning;
}

} // namespace

} // namespace welcomer::desktop

WELCOMER_DESKTOP_MODULE(welcomer::desktop::ResolvedModule, welcomer::desktop::createNameServers,
                        welcomer::desktop::describeNameServers)
