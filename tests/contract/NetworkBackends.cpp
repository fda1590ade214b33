#include "tests/contract/NetworkBackends.h"

#include "backends/local/network/LocalHostReachability.h"
#include "backends/local/network/LocalNetworkConfigStore.h"
#include "backends/local/network/LocalNetworkStateStore.h"
#include "tests/support/NetworkNamespace.h"
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
    void addBridge(const std::string& bridge, const std::string& port) override {
        shell("ip link add " + bridge + " type bridge && ip link set " + bridge +
              " up && ip addr flush dev " + port + " && ip link set " + port + " master " + bridge);
    }

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
    void addBridge(const std::string& bridge, const std::string& port) override {
        shell("nmcli connection add type bridge con-name " + bridge + " ifname " + bridge +
              " autoconnect no stp no ipv4.method disabled ipv6.method disabled && nmcli connection add type "
              "ethernet con-name " +
              bridge + "-port autoconnect no ifname " + port + " master " + bridge);
        shell("nmcli connection up " + bridge + "-port"); // and the bridge with it
        waitFor("ip link show master " + bridge + " | grep -q " + port);
    }

  private:
    KernelBackend _kernel;
    std::unique_ptr<NetworkManagerDaemon> _daemon;
    desktop::DesktopNetwork _network{{_kernel.configStore(), _kernel.stateStore(), _kernel.reachability()},
                                     {nullptr, kNetworkModules}};
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
