#include "backends/Backends.h"

#include "backends/local/LocalPlatform.h"

namespace welcomer {

std::unique_ptr<PlatformOwner> buildPlatform(const PlatformOptions& options) {
    return std::make_unique<local::LocalPlatform>(options);
}

} // namespace welcomer
