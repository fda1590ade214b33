// Reachability as the machine's name lookup and routes give it.

#pragma once

#include "platform/HostReachability.h"

#include <memory>
#include <string>

namespace welcomer::local {

// A host is reachable when its name has an address that the kernel has a route to. Nothing is sent to the
// host. The name lookup and the routes are this machine's own, whatever the root folder. A connection that
// has to be brought up first is not seen here.
class LocalHostReachability final : public platform::HostReachability {
  public:
    std::unique_ptr<platform::HostReachabilityTarget> createTarget(const std::string& hostName) override;
};

} // namespace welcomer::local
