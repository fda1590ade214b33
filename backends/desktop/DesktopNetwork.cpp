#include "backends/desktop/DesktopNetwork.h"

#include <utility>

namespace welcomer::desktop {

DesktopNetwork::DesktopNetwork(const Kernel& kernel, const Modules& modules)
    : _kernel(kernel),
      _configModule(&kernel.configStore, {}, modules),
      _stateModule(&_kernelState, {}, modules) {}

std::shared_ptr<platform::NetworkConfigConnection>
DesktopNetwork::ConfigStore::open(const std::string& name) {
    return _network._configModule.service()->open(name);
}

std::vector<std::shared_ptr<platform::NetworkInterface>> DesktopNetwork::ConfigStore::copyInterfaces() {
    return _network._kernel.configStore.copyInterfaces(); // the same either way
}

std::unique_ptr<platform::NetworkStateConnection>
DesktopNetwork::StateStore::open(const std::string& clientName) {
    return _network._stateModule.service()->stateStore().open(clientName);
}

std::unique_ptr<platform::HostReachabilityTarget>
DesktopNetwork::Reachability::createTarget(const std::string& hostName) {
    return _network._stateModule.service()->hostReachability().createTarget(hostName);
}

std::vector<platform::BackendReport> DesktopNetwork::reports() {
    platform::BackendReport config{"NetworkConfigStore", "local file and kernel", "", ""};
    platform::BackendReport state{"NetworkStateStore", "kernel", "", ""};
    _configModule.describe(config);
    const bool isServed = _stateModule.describe(state);
    // One module is both; a service that does not answer is waited for once.
    platform::BackendReport reachability = state;
    reachability.interface = "HostReachability";
    reachability.backend = isServed ? state.backend : "name lookup and routes";
    return {config, state, reachability};
}

} // namespace welcomer::desktop
