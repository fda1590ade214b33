// The machine's own DHCP client, started for a network device.

#pragma once

#include "backends/posix/RootFolder.h"

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

namespace welcomer::local {

// What the client is told.
struct DHCPRequest {
    std::string device;
    std::optional<std::string> clientID;
    std::vector<std::string> servers; // the name servers to use in place of the network's; empty: those
};

// `dhclient`, or else `udhcpc`, of this machine; the files that it is started with are in "/run/welcomer"
// below the root. One that was started here for a device is ended before the device is given another
// configuration. Any thread, one at a time for each device.
class DHCPClient {
  public:
    explicit DHCPClient(posix::RootFolder root) : _root(std::move(root)) {}

    // Whether the machine has a client.
    bool isInstalled() const;

    // Starts the client in the background; it goes on asking when there is no answer yet. May take a second
    // or two.
    //  result  0 or a NetworkConfigStatus
    std::int32_t start(const DHCPRequest& request) const;

    // Ends the client of a device, where one was started here, and waits for its end for a few seconds.
    void stop(const std::string& device) const;

  private:
    // The path on this machine of a device's files, without their endings; none while there is no folder for
    // them.
    std::optional<std::string> _pathOfFiles(const std::string& device) const;

    const posix::RootFolder _root;
};

} // namespace welcomer::local
