// Whether what waits for the next login fits together: the replay item, and the launch agent.

#pragma once

#include "platform/BackendReport.h"
#include "tools/welcomer/checks/Finding.h"

namespace welcomer::tool {

// Of the user who asks. Asks nobody to unlock a keyring, and starts none. Main thread.
//  credentials  how the credential store is served
Finding checkHandOver(const platform::BackendReport& credentials);

} // namespace welcomer::tool
