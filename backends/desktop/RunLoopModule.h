// The main thread's run loop on GLib's main context, as a module.

#pragma once

#include "platform/RunLoop.h"

namespace welcomer::desktop {

struct RunLoopModule {
    static constexpr char kName[] = "runloop";
    // Its current() is the main thread's loop, whichever thread asks.
    using Interface = platform::RunLoops;
    struct Arguments {};
};

} // namespace welcomer::desktop
