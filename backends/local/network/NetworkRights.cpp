#include "backends/local/network/NetworkRights.h"

#include <linux/capability.h>
#include <sys/syscall.h>
#include <unistd.h>

namespace welcomer::local {

bool mayChangeNetwork() {
    __user_cap_header_struct header = {};
    header.version = _LINUX_CAPABILITY_VERSION_3;
    __user_cap_data_struct data[_LINUX_CAPABILITY_U32S_3] = {};
    return ::syscall(SYS_capget, &header, data) == 0 &&
           (data[CAP_TO_INDEX(CAP_NET_ADMIN)].effective & CAP_TO_MASK(CAP_NET_ADMIN)) != 0;
}

} // namespace welcomer::local
