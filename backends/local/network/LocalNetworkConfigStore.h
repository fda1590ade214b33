// The persistent network configuration in a file, applied to the kernel.

#pragma once

#include "backends/network/NameServerService.h"
#include "backends/posix/RootFolder.h"
#include "platform/NetworkConfigStore.h"

namespace welcomer::local {

// Stored is what NetworkFile.h describes; committing takes the right to change the network (CAP_NET_ADMIN).
// The interfaces are the kernel's links, whatever the root folder.
//
// A set also lists a service for every piece of hardware that has no stored one, so that those who may not
// store see what there is; establishing the default configuration has them stored. They ask for their address
// by DHCP.
//
// Applying configures the devices of the services whose protocols were configured through the connection,
// whether enabled or not, and leaves all others alone: a default that was merely stored starts nothing.
class LocalNetworkConfigStore final : public platform::NetworkConfigStore {
  public:
    //  nameServers  as KernelApplier.h has it; borrowed
    explicit LocalNetworkConfigStore(posix::RootFolder root,
                                     network::NameServerService* nameServers = nullptr)
        : _root(std::move(root)),
          _nameServers(nameServers) {}

    std::shared_ptr<platform::NetworkConfigConnection> open(const std::string& name) override;
    std::vector<std::shared_ptr<platform::NetworkInterface>> copyInterfaces() override;

  private:
    const posix::RootFolder _root;
    network::NameServerService* const _nameServers;
};

} // namespace welcomer::local
