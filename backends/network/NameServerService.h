// Another program that decides about the machine's name servers.

#pragma once

#include <cstdint>
#include <string>
#include <vector>

namespace welcomer::network {

// systemd-resolved, where /etc/resolv.conf is its own. The embedded side has no client of it: whoever puts a
// platform together from the desktop's services hands one in.
class NameServerService {
  public:
    virtual ~NameServerService() = default;

    // Has it ask these servers about what is looked up through a device, in place of those that it was told
    // of before; all or nothing.
    //  servers  addresses, checked before
    //  detail   receives on failure what it is about, where that is known
    //  result   0 or a NetworkConfigStatus
    // Any thread; may block for as long as the service is given to answer.
    virtual std::int32_t setServers(const std::string& device, const std::vector<std::string>& servers,
                                    std::string& detail) = 0;
};

} // namespace welcomer::network
