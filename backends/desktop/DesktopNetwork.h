// The network: NetworkManager's, where it runs and the modules are there; the kernel's elsewhere.

#pragma once

#include "backends/desktop/DesktopModule.h"
#include "backends/desktop/NetworkModule.h"
#include "platform/BackendReport.h"

#include <string>
#include <vector>

namespace welcomer::desktop {

class DesktopNetwork {
  public:
    // The kernel backend's services; borrowed.
    struct Kernel {
        platform::NetworkConfigStore& configStore;
        platform::NetworkStateStore& stateStore;
        platform::HostReachability& hostReachability;
    };

    explicit DesktopNetwork(const Kernel& kernel, const Modules& modules = {});

    // Each loads its module when it is first used, not before. Borrowed.
    platform::NetworkConfigStore& configStore() { return _configStore; }
    platform::NetworkStateStore& stateStore() { return _stateStore; }
    platform::HostReachability& hostReachability() { return _hostReachability; }

    // One for each of the three. Any thread; loads the modules.
    std::vector<platform::BackendReport> reports();

  private:
    class ConfigStore final : public platform::NetworkConfigStore {
      public:
        explicit ConfigStore(DesktopNetwork& network) : _network(network) {}
        std::shared_ptr<platform::NetworkConfigConnection> open(const std::string& name) override;
        std::vector<std::shared_ptr<platform::NetworkInterface>> copyInterfaces() override;

      private:
        DesktopNetwork& _network;
    };

    class StateStore final : public platform::NetworkStateStore {
      public:
        explicit StateStore(DesktopNetwork& network) : _network(network) {}
        std::unique_ptr<platform::NetworkStateConnection> open(const std::string& clientName) override;

      private:
        DesktopNetwork& _network;
    };

    class Reachability final : public platform::HostReachability {
      public:
        explicit Reachability(DesktopNetwork& network) : _network(network) {}
        std::unique_ptr<platform::HostReachabilityTarget> createTarget(const std::string& hostName) override;

      private:
        DesktopNetwork& _network;
    };

    class KernelState final : public NetworkStateServices {
      public:
        explicit KernelState(const Kernel& kernel) : _kernel(kernel) {}
        platform::NetworkStateStore& stateStore() override { return _kernel.stateStore; }
        platform::HostReachability& hostReachability() override { return _kernel.hostReachability; }

      private:
        const Kernel _kernel;
    };

    const Kernel _kernel;
    KernelState _kernelState{_kernel};
    DesktopModule<NetworkConfigModule> _configModule;
    DesktopModule<NetworkStateModule> _stateModule;
    ConfigStore _configStore{*this};
    StateStore _stateStore{*this};
    Reachability _hostReachability{*this};
};

} // namespace welcomer::desktop
