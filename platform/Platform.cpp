#include "platform/Platform.h"

#include <atomic>
#include <cstdio>
#include <cstdlib>

namespace welcomer::platform {

namespace {

std::atomic<const Platform*> installed = nullptr;

} // namespace

const Platform& current() {
    const Platform* platform = installed.load(std::memory_order_acquire);
    if (!platform) {
        std::fputs("welcomer: no platform is installed; build one with buildPlatform() and install it with "
                   "ScopedPlatform before anything else is called\n",
                   stderr);
        std::abort();
    }
    return *platform;
}

ScopedPlatform::ScopedPlatform(const Platform& platform) : _previous(installed.exchange(&platform)) {}

ScopedPlatform::~ScopedPlatform() {
    installed.store(_previous, std::memory_order_release);
}

} // namespace welcomer::platform
