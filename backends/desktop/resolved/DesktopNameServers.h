// systemd-resolved's name servers, where the module for them is there.

#pragma once

#include "backends/desktop/DesktopModule.h"
#include "backends/desktop/resolved/ResolvedModule.h"

#include <string>
#include <utility>
#include <vector>

namespace welcomer::desktop {

class DesktopNameServers final : public network::NameServerService {
  public:
    explicit DesktopNameServers(Modules modules = {}) : _module(nullptr, {}, std::move(modules)) {}

    // Loads the module when it is first needed. Without it, the name servers are another program's.
    std::int32_t setServers(const std::string& device, const std::vector<std::string>& servers,
                            std::string& detail) override;

  private:
    DesktopModule<ResolvedModule> _module;
};

} // namespace welcomer::desktop
