#include "backends/desktop/DesktopPlatform.h"

namespace welcomer::desktop {

namespace {

PlatformOptions withRunLoops(PlatformOptions options, platform::RunLoops& runLoops) {
    if (!options.runLoops) {
        options.runLoops = &runLoops;
    }
    return options;
}

} // namespace

DesktopPlatform::DesktopPlatform(const PlatformOptions& options)
    : _local(withRunLoops(options, _runLoops)),
      _platform(_local.platform()) {}

std::vector<platform::BackendReport> DesktopPlatform::backendReports() {
    std::vector<platform::BackendReport> reports;
    reports.push_back(_runLoops.report());
    return reports;
}

} // namespace welcomer::desktop
