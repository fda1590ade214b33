// systemd-resolved as the one who is told of name servers, as a module.

#pragma once

#include "backends/network/NameServerService.h"

namespace welcomer::desktop {

struct ResolvedModule {
    static constexpr char kName[] = "resolved";
    using Interface = network::NameServerService;
    struct Arguments {};
};

} // namespace welcomer::desktop
