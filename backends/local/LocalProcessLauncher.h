// Running the machine's programs with posix_spawn.

#pragma once

#include "platform/ProcessLauncher.h"

namespace welcomer::local {

class LocalProcessLauncher final : public platform::ProcessLauncher {
  public:
    int launchAndWait(const std::string& program, const std::vector<std::string>& arguments) override;
};

} // namespace welcomer::local
