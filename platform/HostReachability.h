// Whether a host could be reached from this machine as its network is now.

#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>

namespace welcomer::platform {

// What a target's flags may hold; bits of other values have no meaning here.
enum HostReachabilityFlag : std::uint32_t {
    kHostReachable = 2,          // there is a way to the host
    kHostConnectionRequired = 4, // but only after a connection has been brought up or a portal passed
};

// A host whose reachability is asked for. Any thread.
class HostReachabilityTarget {
  public:
    virtual ~HostReachabilityTarget() = default;

    // The flags as they are now, or none when they cannot be read. Blocks for as long as the system's name
    // lookup takes, with no time limit of its own; sends nothing to the host itself.
    virtual std::optional<std::uint32_t> flags() = 0;
};

// Any thread.
class HostReachability {
  public:
    virtual ~HostReachability() = default;

    // Makes a target; nothing is looked up yet.
    //  hostName  a name or an address in text, in the system's own encoding
    //  result    never null
    virtual std::unique_ptr<HostReachabilityTarget> createTarget(const std::string& hostName) = 0;
};

} // namespace welcomer::platform
