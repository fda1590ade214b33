// Responses that the user has the server give, as options name them.

#pragma once

#include "propertylist/PropertyList.h"

#include <string>
#include <vector>

namespace welcomer::tool {

// Reads the files of options such as "org.example.notes=answer.plist".
//  given   each a delegate's identifier, "=", and a property-list file, "-" being the standard input
//  result  the responses by identifier; of two for one the last
// Throws UsageError for what is no such option, and CommandFailure for a file that cannot be read.
PropertyList::Dictionary readDelegateResponses(const std::vector<std::string>& given);

} // namespace welcomer::tool
