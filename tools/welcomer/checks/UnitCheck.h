// Whether something starts the user's launch agents at a login, and whether the system's units are well.

#pragma once

#include "tools/welcomer/checks/Finding.h"

namespace welcomer::tool {

// Looks at the files, and where the machine's own service managers run asks them.
//  isWholeMachine  whether the root folder is the machine's own
// Main thread.
Findings checkUnits(bool isWholeMachine);

} // namespace welcomer::tool
