// The state of the network as the kernel and the resolver's file have it.

#pragma once

#include "backends/posix/RootFolder.h"
#include "platform/NetworkStateStore.h"

namespace welcomer::local {

// Links, addresses and routes are those of the kernel, whatever the root folder; name servers and domain
// those of /etc/resolv.conf. The primary service is that of the device which the main table's default route
// with the lowest metric leads to. A device that has no stored service counts as a service whose ID is the
// device's name. The setup domain is what is stored (NetworkFile.h).
class LocalNetworkStateStore final : public platform::NetworkStateStore {
  public:
    explicit LocalNetworkStateStore(posix::RootFolder root) : _root(std::move(root)) {}

    // Never null: a kernel that cannot be asked shows as one without a network.
    std::unique_ptr<platform::NetworkStateConnection> open(const std::string& clientName) override;

  private:
    const posix::RootFolder _root;
};

} // namespace welcomer::local
