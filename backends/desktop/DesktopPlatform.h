// The platform on the desktop's own services, each of which serves where it is there; the local backends
// serve elsewhere.

#pragma once

#include "backends/Backends.h"
#include "backends/desktop/DesktopRunLoops.h"
#include "backends/local/LocalPlatform.h"

#include <vector>

namespace welcomer::desktop {

// Making one loads nothing and costs no system call. Only for the root "/": the desktop's services know no
// other.
class DesktopPlatform final : public PlatformOwner {
  public:
    explicit DesktopPlatform(const PlatformOptions& options);

    const platform::Platform& platform() const override { return _platform; }
    std::vector<platform::BackendReport> backendReports() override;

  private:
    DesktopRunLoops _runLoops;
    local::LocalPlatform _local; // stands on _runLoops
    const platform::Platform _platform;
};

} // namespace welcomer::desktop
