// The main thread's run loop on GLib's main context, as a module.

#pragma once

#include "platform/RunLoop.h"

namespace welcomer::desktop {

struct RunLoopModule {
    static constexpr char kName[] = "runloop";
    // Its current() is the main thread's loop, whichever thread asks. Made on the main thread, which owns
    // GLib's default main context from then on; there is none when another thread has taken that before.
    using Interface = platform::RunLoops;
    struct Arguments {};
};

} // namespace welcomer::desktop
