#include "backends/Backends.h"

#include "backends/local/LocalPlatform.h"
#ifdef WELCOMER_DESKTOP
#include "backends/desktop/DesktopPlatform.h"
#include "backends/desktop/ServedPlatform.h"
#endif

namespace welcomer {

std::unique_ptr<PlatformOwner> buildPlatform(const PlatformOptions& options) {
#ifdef WELCOMER_DESKTOP
    // The desktop's services know of no other root.
    if (options.root == "/") {
        return std::make_unique<desktop::DesktopPlatform>(options);
    }
    if (!options.accountServer.empty()) {
        return std::make_unique<desktop::ServedPlatform>(options);
    }
#endif
    return std::make_unique<local::LocalPlatform>(options);
}

} // namespace welcomer
