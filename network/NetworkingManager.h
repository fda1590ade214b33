// The network as setup sees it.

#pragma once

namespace welcomer {

// Made once per setup run; used by one thread at a time.
class NetworkingManager {
  public:
    // Whether the internet can be reached: the public web host is reachable without a connection having to be
    // brought up first. False also when that cannot be found out. Blocks for as long as the platform takes to
    // answer.
    static bool internetIsReachable();
};

} // namespace welcomer
