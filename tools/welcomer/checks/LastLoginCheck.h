// How the last login went.

#pragma once

#include "tools/welcomer/checks/Finding.h"

#include <string>

namespace welcomer::tool {

// Of the user who asks.
//  root  below which the logs are looked up
Finding checkLastLogin(const std::string& root);

} // namespace welcomer::tool
