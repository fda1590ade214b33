#include "platform/NetworkConfigStore.h"

#include <system_error>

namespace welcomer::platform {

std::string networkConfigStatusText(std::int32_t status) {
    switch (status) {
    case kNetworkConfigSuccess:
        return "no error";
    case kNetworkConfigAccessDenied:
        return "changing the network takes rights that are missing";
    case kNetworkConfigNotFound:
        return "what was to be changed is not there any more";
    case kNetworkConfigAlreadyThere:
        return "the service has a protocol of that type already";
    case kNetworkConfigReadFailed:
        return "the stored configuration cannot be read";
    case kNetworkConfigWriteFailed:
        return "the configuration could not be stored";
    case kNetworkConfigNoDevice:
        return "there is no such network device";
    case kNetworkConfigInvalid:
        return "an address, a subnet mask, a router or a name server is missing or makes no sense";
    case kNetworkConfigUnknownMethod:
        return "the configuration method is not known";
    case kNetworkConfigNoDHCPClient:
        return "there is no DHCP client on this machine";
    case kNetworkConfigDHCPClientFailed:
        return "the DHCP client could not be started";
    case kNetworkConfigNameServersElsewhere:
        return "the name servers are another program's";
    case kNetworkConfigNameServersNotWritten:
        return "the name servers could not be stored";
    case kNetworkConfigNotActivated:
        return "the network did not come up with this configuration";
    case kNetworkConfigInUse:
        return "the configuration is locked by another process: waited 10 seconds";
    case kNetworkConfigNameServiceSilent:
        return "the service that decides about the name servers does not answer";
    default:
        break;
    }
    if (status > kNetworkConfigKernelRefused) {
        return "the kernel refused: " + std::generic_category().message(status - kNetworkConfigKernelRefused);
    }
    return "error " + std::to_string(status);
}

} // namespace welcomer::platform
