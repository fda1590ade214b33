#include "network/NetworkingManager.h"

#include "generated/WelcomerConfiguration.h"
#include "platform/Platform.h"

#include <cstdint>
#include <optional>
#include <string>

namespace welcomer {

bool NetworkingManager::internetIsReachable() {
    const std::optional<std::uint32_t> flags =
        platform::current()
            .hostReachability.createTarget(std::string(configuration::kPublicWebHost))
            ->flags();
    constexpr std::uint32_t kMask = platform::kHostReachable | platform::kHostConnectionRequired;
    return flags && (*flags & kMask) == platform::kHostReachable;
}

} // namespace welcomer
