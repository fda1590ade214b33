#include "platform/Platform.h"

#include <atomic>
#include <cassert>

namespace welcomer::platform {

namespace {

std::atomic<const Platform*> installed = nullptr;

} // namespace

const Platform& current() {
    const Platform* platform = installed.load(std::memory_order_acquire);
    assert(platform && "no platform is installed");
    return *platform;
}

ScopedPlatform::ScopedPlatform(const Platform& platform) : _previous(installed.exchange(&platform)) {}

ScopedPlatform::~ScopedPlatform() {
    installed.store(_previous, std::memory_order_release);
}

} // namespace welcomer::platform
