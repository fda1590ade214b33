// The network on NetworkManager, as two modules: storing and applying takes its client library, and finding
// out how the network is does not, which starts in half of the time.

#pragma once

#include "platform/HostReachability.h"
#include "platform/NetworkConfigStore.h"
#include "platform/NetworkStateStore.h"

namespace welcomer::desktop {

// Each service turns to the kernel backend by itself while NetworkManager does not run.
struct NetworkConfigModule {
    static constexpr char kName[] = "networkconfig";
    using Interface = platform::NetworkConfigStore;
    struct Arguments {};
};

// The two interfaces that tell how the network is.
class NetworkStateServices {
  public:
    virtual ~NetworkStateServices() = default;

    // Borrowed: live as long as this object.
    virtual platform::NetworkStateStore& stateStore() = 0;
    virtual platform::HostReachability& hostReachability() = 0;
};

struct NetworkStateModule {
    static constexpr char kName[] = "networkstate";
    using Interface = NetworkStateServices;
    struct Arguments {};
};

} // namespace welcomer::desktop
