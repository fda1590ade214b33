#include "tools/welcomer/story/ReplayReason.h"

#include <charconv>
#include <optional>

namespace welcomer::tool {

namespace {

// The credential store's status that a log line ends in; none when it does not.
std::optional<std::int32_t> statusIn(const std::string& line) {
    constexpr std::string_view beforeStatus = "replay keychain item: ";
    const std::size_t position = line.rfind(beforeStatus);
    if (position == std::string::npos) {
        return std::nullopt;
    }
    std::int32_t status = 0;
    const char* const end = line.data() + line.size();
    const auto result = std::from_chars(line.data() + position + beforeStatus.size(), end, status);
    return result.ec == std::errc() && result.ptr == end ? std::optional(status) : std::nullopt;
}

} // namespace

std::string replayReason(const KeptLog& log) {
    const std::string line = log.reason();
    const std::optional<std::int32_t> status = statusIn(line);
    return status ? line + " (" + platform::credentialStatusText(*status) + ")" : line;
}

std::string storingReason(const KeptLog& log, const platform::CredentialOutcome& stored) {
    if (stored == platform::kCredentialSuccess) {
        return log.reason();
    }
    return log.reason() + " (" + platform::credentialOutcomeText(stored) + ")" + storingAdvice(stored.status);
}

std::string storingAdvice(std::int32_t status) {
    return platform::credentialServiceWasNotAsked(status) ? "; --local stores it in the user's local file"
                                                          : "";
}

} // namespace welcomer::tool
