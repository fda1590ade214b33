// The persistent network configuration as NetworkManager's connection profiles.

#pragma once

#include "platform/NetworkConfigStore.h"

namespace welcomer::desktop {

// There is one set. Its services are the profiles, those in use first and then in the order in which
// NetworkManager would choose; ports of other links and what NetworkManager merely found on a device are left
// out, and so is a profile whose device is a port of a bridge or a bond by now. A wired device that it
// manages and that no profile fits is listed with a service of its own, which is stored once it is
// established or changed. The interfaces are the kernel's.
//
// Committing writes the profiles of changed services to disk, merged into what they are by then; where one
// cannot be written, those before it are put back. Applying has each device use the profile whose protocols
// were configured through the connection: at once where the device runs that profile already, by activating
// it otherwise. It waits until the device has an address that the service gives, or with DHCP and BOOTP until
// it asks the network for one and has none of before; for at most a minute and a half.
//
// Without NetworkManager, connections are the kernel backend's.
class NetworkManagerConfigStore final : public platform::NetworkConfigStore {
  public:
    //  kernel  lists the interfaces, and serves where NetworkManager does not run; borrowed
    explicit NetworkManagerConfigStore(platform::NetworkConfigStore& kernel) : _kernel(kernel) {}

    std::shared_ptr<platform::NetworkConfigConnection> open(const std::string& name) override;
    std::vector<std::shared_ptr<platform::NetworkInterface>> copyInterfaces() override;

  private:
    platform::NetworkConfigStore& _kernel;
};

} // namespace welcomer::desktop
