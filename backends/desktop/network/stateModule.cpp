#include "backends/desktop/ModuleEntry.h"
#include "backends/desktop/NetworkModule.h"
#include "backends/desktop/network/NetworkManagerReachability.h"
#include "backends/desktop/network/NetworkManagerReport.h"
#include "backends/desktop/network/NetworkManagerStateStore.h"

namespace welcomer::desktop {

namespace {

class NetworkManagerState final : public NetworkStateServices {
  public:
    explicit NetworkManagerState(NetworkStateServices& kernel)
        : _stateStore(kernel.stateStore()),
          _hostReachability(kernel.hostReachability()) {}

    platform::NetworkStateStore& stateStore() override { return _stateStore; }
    platform::HostReachability& hostReachability() override { return _hostReachability; }

  private:
    NetworkManagerStateStore _stateStore;
    NetworkManagerReachability _hostReachability;
};

std::unique_ptr<NetworkStateServices> createNetworkState(NetworkStateServices* kernel,
                                                         const NetworkStateModule::Arguments& /*arguments*/,
                                                         std::string& /*whyNot*/) {
    return std::make_unique<NetworkManagerState>(*kernel);
}

bool describeNetworkState(const NetworkStateModule::Arguments& /*arguments*/,
                          platform::BackendReport& report) {
    return reportNetworkManager(report);
}

} // namespace

} // namespace welcomer::desktop

WELCOMER_DESKTOP_MODULE(welcomer::desktop::NetworkStateModule, welcomer::desktop::createNetworkState,
                        welcomer::desktop::describeNetworkState)
