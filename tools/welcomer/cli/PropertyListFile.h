// Property lists that the user hands to a command.

#pragma once

#include "propertylist/PropertyList.h"

#include <string>

namespace welcomer::tool {

// Reads a property-list file of any format.
//  path  the user's own path, not below --root; "-" is the standard input
// Throws CommandFailure with the path and what is wrong where.
PropertyList readPropertyListFile(const std::string& path);

} // namespace welcomer::tool
