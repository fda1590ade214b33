#include "tools/welcomer/story/ReplayReason.h"

namespace welcomer::tool {

std::string replayReason(const KeptLog& log, std::int32_t status) {
    const std::string line = log.reason();
    return status == platform::kCredentialSuccess
               ? line
               : line + " (" + platform::credentialStatusText(status) + ")";
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
