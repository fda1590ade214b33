// Why an operation on the replay item failed, for people.

#pragma once

#include "platform/CredentialStore.h"
#include "tools/welcomer/cli/KeptLog.h"

#include <cstdint>
#include <string>

namespace welcomer::tool {

// The system's last log line, and the text of the credential store's status where that is no success.
std::string replayReason(const KeptLog& log, std::int32_t status);

// The same for an item that was to be stored and the agent that was to be installed: with the reason that the
// log line has no place for, and what else can be done where the keyring could not be asked.
//  stored  what came of storing the item
std::string storingReason(const KeptLog& log, const platform::CredentialOutcome& stored);

// What else can be done with an item where a status says that the keyring could not be asked; else empty.
std::string storingAdvice(std::int32_t status);

} // namespace welcomer::tool
