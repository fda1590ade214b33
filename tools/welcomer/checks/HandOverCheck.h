// Whether what waits for the next login fits together: the replay item, and the launch agent.

#pragma once

#include "tools/welcomer/checks/Finding.h"

namespace welcomer::tool {

// Of the user who asks. Asks nobody to unlock a keyring. Main thread.
Finding checkHandOver();

} // namespace welcomer::tool
