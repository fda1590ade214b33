// Run loops: GLib's main context for the main thread, so that whatever uses GLib there keeps working while
// the system waits; the local backend's loops for every other thread, and where GLib's is not there.

#pragma once

#include "backends/desktop/DesktopModule.h"
#include "backends/desktop/runloop/RunLoopModule.h"
#include "backends/local/time/LocalRunLoops.h"

#include <utility>

namespace welcomer::desktop {

// The main thread's loop, once asked for, is the same until the process ends. Whoever loads plug-ins asks for
// it before: a thread of theirs that runs GLib's main context first would keep it, and leave the main thread
// the local loop.
class DesktopRunLoops final : public platform::RunLoops {
  public:
    explicit DesktopRunLoops(Modules modules = {}) : _module(&_local, {}, std::move(modules)) {}

    std::shared_ptr<platform::RunLoop> current() override;

    // Any thread; loads the module.
    platform::BackendReport report();

  private:
    local::LocalRunLoops _local;
    DesktopModule<RunLoopModule> _module;
};

} // namespace welcomer::desktop
