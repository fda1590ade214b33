// Why an operation on the replay item failed, for people.

#pragma once

#include "tools/welcomer/cli/KeptLog.h"

#include <cstdint>
#include <string>

namespace welcomer::tool {

// The system's last log line. Where it ends in a status of the credential store, the status's text follows.
std::string replayReason(const KeptLog& log);

// The same for an item that was to be stored: with what else can be done where the keyring could not be
// asked.
std::string storingReason(const KeptLog& log);

// What else can be done with an item where a status says that the keyring could not be asked; else empty.
std::string storingAdvice(std::int32_t status);

} // namespace welcomer::tool
