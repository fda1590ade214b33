// Having a link of the kernel take a configuration.

#pragma once

#include "backends/local/network/DHCPClient.h"
#include "backends/network/IPv4Configuration.h"
#include "backends/network/NameServerService.h"
#include "backends/posix/KernelNetwork.h"
#include "backends/posix/RootFolder.h"

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

namespace welcomer::local {

// One thread at a time for each device.
class KernelApplier {
  public:
    //  nameServers  told of the name servers where /etc/resolv.conf is systemd-resolved's; borrowed, or null
    explicit KernelApplier(posix::RootFolder root, network::NameServerService* nameServers = nullptr)
        : _root(std::move(root)),
          _client(_root),
          _nameServers(nameServers) {}

    // Applies it, all or nothing: after a failure the link's addresses and routes are those of before, and so
    // are the machine's name servers.
    //  manual, inform  the address becomes the link's only IPv4 address, and the router its only default
    //                  route, with the lowest metric that no other link's has; theirs stay. No router, no
    //                  route. The DHCP clients that are used here cannot ask for the rest alone. One that was
    //                  started here for the link is ended.
    //  DHCP, BootP     the link loses its IPv4 addresses and default routes, and the machine's DHCP client is
    //                  started for it; it waits for no answer
    //  others          the link stays as it is
    // Name servers, where there are some, go to /etc/resolv.conf, or to whom that belongs.
    //  device  the link's name
    //  detail  receives on failure the device or the file that it is about
    //  result  0 or a NetworkConfigStatus
    // Blocks for up to a few seconds.
    std::int32_t apply(const network::IPv4Configuration& configuration, const std::string& device,
                       std::string& detail);

  private:
    std::int32_t _applyToLink(const network::IPv4Configuration& configuration, const posix::KernelLink& link,
                              std::string& detail);
    int _setAddress(const network::IPv4Configuration& configuration, int linkIndex);
    std::int32_t _startClient(const network::IPv4Configuration& configuration, const posix::KernelLink& link);
    int _removeOthers(int linkIndex, const std::optional<posix::KernelAddress>& address,
                      const std::optional<posix::KernelRoute>& route, bool& isRemoved);
    std::int32_t _setServers(const std::vector<std::string>& servers, const std::string& device,
                             std::string& detail);

    const posix::RootFolder _root;
    const DHCPClient _client;
    network::NameServerService* const _nameServers;
    posix::KernelNetwork _kernel;
};

} // namespace welcomer::local
