// What is to be said about NetworkManager in a report.

#pragma once

#include "platform/BackendReport.h"

namespace welcomer::desktop {

// Fills in who serves and why, or why NetworkManager does not and what would be needed.
//  result  whether NetworkManager runs
// Any thread; asks NetworkManager.
bool reportNetworkManager(platform::BackendReport& report);

} // namespace welcomer::desktop
