// The state of the network as NetworkManager has it.

#pragma once

#include "platform/NetworkStateStore.h"

namespace welcomer::desktop {

// The primary service is NetworkManager's primary connection; router, name servers and domain are that
// connection's. A service's addresses are those of its connection in use, the setup domain is what its
// profile says. Links, and everything that NetworkManager knows nothing of, are as the kernel backend has
// them; so is all of it while NetworkManager does not run.
class NetworkManagerStateStore final : public platform::NetworkStateStore {
  public:
    //  kernel  borrowed; must outlive the connections, too
    explicit NetworkManagerStateStore(platform::NetworkStateStore& kernel) : _kernel(kernel) {}

    std::unique_ptr<platform::NetworkStateConnection> open(const std::string& clientName) override;

  private:
    platform::NetworkStateStore& _kernel;
};

} // namespace welcomer::desktop
