#include "backends/desktop/runloop/DesktopRunLoops.h"

#include <unistd.h>

namespace welcomer::desktop {

std::shared_ptr<platform::RunLoop> DesktopRunLoops::current() {
    const bool isMainThread = ::gettid() == ::getpid();
    return isMainThread ? _module.service()->current() : _local.current();
}

platform::BackendReport DesktopRunLoops::report() {
    platform::BackendReport report{"RunLoop", "standard threads", "", ""};
    _module.describe(report);
    return report;
}

} // namespace welcomer::desktop
