// Whether the files in /etc/resolver reach the machine's resolver.

#pragma once

#include "platform/BackendReport.h"

#include <string>

namespace welcomer::tool {

//  root  the folder below which the system's paths lie; "/" for this machine's own
platform::BackendReport resolverReport(const std::string& root);

} // namespace welcomer::tool
