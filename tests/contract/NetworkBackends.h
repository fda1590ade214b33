// What the contract tests of the network are run on.

#pragma once

#include "platform/HostReachability.h"
#include "platform/NetworkConfigStore.h"
#include "platform/NetworkStateStore.h"
#include "tests/contract/TemporaryRoot.h"

#include <functional>
#include <memory>
#include <ostream>
#include <string>
#include <vector>

namespace welcomer {

class NetworkBackend {
  public:
    virtual ~NetworkBackend() = default;
    virtual platform::NetworkConfigStore& configStore() = 0;
    virtual platform::NetworkStateStore& stateStore() = 0;
    virtual platform::HostReachability& reachability() = 0;

    // Returns once the backend has noticed a device that has just been made.
    virtual void waitForDevice(const std::string& device) = 0;

    // Makes a bridge that takes a device over, the way the backend's users do.
    virtual void addBridge(const std::string& bridge, const std::string& port) = 0;
};

// Makes a backend on a root folder, in this process's own network namespace; may take over its mounts.
using NetworkBackendMaker = std::function<std::unique_ptr<NetworkBackend>(const TemporaryRoot& root)>;

struct NamedNetworkBackend {
    std::string name;
    NetworkBackendMaker make;

    friend void PrintTo(const NamedNetworkBackend& backend, std::ostream* stream) { *stream << backend.name; }
};

// Every backend that was built, that on the kernel first.
std::vector<NamedNetworkBackend> networkBackends();

} // namespace welcomer
