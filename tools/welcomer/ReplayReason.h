// Why an operation on the replay item failed, for people.

#pragma once

#include "tools/welcomer/KeptLog.h"

#include <string>

namespace welcomer::tool {

// The system's last log line. Where it ends in a status of the credential store, the status's text follows.
std::string replayReason(const KeptLog& log);

} // namespace welcomer::tool
