#include "tests/contract/NetworkBackends.h"

#include "backends/local/network/LocalHostReachability.h"
#include "backends/local/network/LocalNetworkConfigStore.h"
#include "backends/local/network/LocalNetworkStateStore.h"
#ifdef WELCOMER_DESKTOP_NETWORK
#include "backends/desktop/DesktopNetwork.h"
#include "tests/support/MountNamespace.h"
#include "tests/support/NetworkManagerDaemon.h"

#include <stdexcept>
#endif

namespace welcomer {

namespace {

class KernelBackend final : public NetworkBackend {
  public:
    explicit KernelBackend(const TemporaryRoot& root)
        : _configStore(posix::RootFolder(root.path())),
          _stateStore(posix::RootFolder(root.path())) {}

    platform::NetworkConfigStore& configStore() override { return _configStore; }
    platform::NetworkStateStore& stateStore() override { return _stateStore; }
    platform::HostReachability& reachability() override { return _reachability; }
    void waitForDevice(const std::string&) override {}

  private:
    local::LocalNetworkConfigStore _configStore;
    local::LocalNetworkStateStore _stateStore;
    local::LocalHostReachability _reachability;
};

#ifdef WELCOMER_DESKTOP_NETWORK
class NetworkManagerBackend final : public NetworkBackend {
  public:
    explicit NetworkManagerBackend(const TemporaryRoot& root) : _kernel(root) {
        enterMountNamespace();
        _daemon = std::make_unique<NetworkManagerDaemon>();
        // Else this would be the kernel's once more.
        for (const platform::BackendReport& report : _network.reports()) {
            if (report.backend != "NetworkManager") {
                throw std::runtime_error(report.interface + ": " + report.reason);
            }
        }
    }

    platform::NetworkConfigStore& configStore() override { return _network.configStore(); }
    platform::NetworkStateStore& stateStore() override { return _network.stateStore(); }
    platform::HostReachability& reachability() override { return _network.hostReachability(); }
    void waitForDevice(const std::string& device) override { waitForManaged(device); }

  private:
    KernelBackend _kernel;
    std::unique_ptr<NetworkManagerDaemon> _daemon;
    desktop::DesktopNetwork _network{{_kernel.configStore(), _kernel.stateStore(), _kernel.reachability()},
                                     kNetworkModules};
};
#endif

template <class Backend>
std::unique_ptr<NetworkBackend> make(const TemporaryRoot& root) {
    return std::make_unique<Backend>(root);
}

} // namespace

std::vector<NamedNetworkBackend> networkBackends() {
    return {{"Kernel", make<KernelBackend>},
#ifdef WELCOMER_DESKTOP_NETWORK
            {"NetworkManager", make<NetworkManagerBackend>}
#endif
    };
}

} // namespace welcomer
