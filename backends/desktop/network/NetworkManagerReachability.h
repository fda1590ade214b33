// Reachability as the kernel backend has it, and what NetworkManager knows of captive portals.

#pragma once

#include "platform/HostReachability.h"

namespace welcomer::desktop {

// A host that could be reached needs a connection first while NetworkManager finds a captive portal; it is
// asked to look anew each time, since it remembers a portal that has been passed. Which address it looks at
// is its own configuration; without one it finds no portal.
class NetworkManagerReachability final : public platform::HostReachability {
  public:
    //  kernel  looks up names and routes; borrowed, must outlive the targets, too
    explicit NetworkManagerReachability(platform::HostReachability& kernel) : _kernel(kernel) {}

    std::unique_ptr<platform::HostReachabilityTarget> createTarget(const std::string& hostName) override;

  private:
    platform::HostReachability& _kernel;
};

} // namespace welcomer::desktop
