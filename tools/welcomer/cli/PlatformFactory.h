// How the tool gets a platform: main.cpp, which knows the backends, hands this to everything else.

#pragma once

#include "platform/PlatformOwner.h"

#include <functional>
#include <memory>

namespace welcomer::tool {

enum class TimeKind {
    Real,
    Simulated, // clock, run loops and queues on simulated time, which the options then leave alone
};

// Builds a platform; opens nothing and starts no thread.
using PlatformFactory =
    std::function<std::shared_ptr<PlatformOwner>(const PlatformOptions& options, TimeKind time)>;

} // namespace welcomer::tool
