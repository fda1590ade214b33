#include "tools/welcomer/ReplayReason.h"

#include "platform/CredentialStore.h"

#include <charconv>

namespace welcomer::tool {

std::string replayReason(const KeptLog& log) {
    std::string line = log.reason();
    constexpr std::string_view beforeStatus = "replay keychain item: ";
    const std::size_t position = line.rfind(beforeStatus);
    if (position == std::string::npos) {
        return line;
    }
    std::int32_t status = 0;
    const char* const end = line.data() + line.size();
    const auto result = std::from_chars(line.data() + position + beforeStatus.size(), end, status);
    const bool isStatus = result.ec == std::errc() && result.ptr == end;
    return isStatus ? line + " (" + platform::credentialStatusText(status) + ")" : line;
}

} // namespace welcomer::tool
