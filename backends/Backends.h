// Builds the platform from what this machine has. Only programs and tests include this.

#pragma once

#include "platform/PlatformOwner.h"

#include <memory>

namespace welcomer {

// Builds the platform: on the desktop's own services for the root "/", where they are built in and there, and
// on nothing but the kernel and files elsewhere. Opens nothing and starts no thread: each service does its
// work when it is first asked.
std::unique_ptr<PlatformOwner> buildPlatform(const PlatformOptions& options = {});

} // namespace welcomer
