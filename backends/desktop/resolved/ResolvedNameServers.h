// systemd-resolved, told of name servers on the system bus.

#pragma once

#include "backends/network/NameServerService.h"

#include <string>
#include <vector>

namespace welcomer::desktop {

// Asks the running service and starts nobody. The bus and the service have ten seconds together.
class ResolvedNameServers final : public network::NameServerService {
  public:
    //  detail  receives on failure the device, or what the bus or the service said
    //  result  0; kNetworkConfigNoDevice; kNetworkConfigNameServersElsewhere when the service does not run;
    //          kNetworkConfigNameServiceSilent when it does not answer, which may then still set them;
    //          kNetworkConfigNameServersNotWritten when it refuses
    std::int32_t setServers(const std::string& device, const std::vector<std::string>& servers,
                            std::string& detail) override;
};

// Whether the service runs, as far as the system bus knows.
//  whyNot  receives why it does not
bool isResolvedRunning(std::string& whyNot);

} // namespace welcomer::desktop
