#include "tools/welcomer/story/DelegateResponses.h"

#include "tools/welcomer/cli/PropertyListFile.h"
#include "tools/welcomer/terminal/Failure.h"

namespace welcomer::tool {

PropertyList::Dictionary readDelegateResponses(const std::vector<std::string>& given) {
    PropertyList::Dictionary responses;
    for (const std::string& each : given) {
        const std::size_t end = each.find('=');
        if (end == 0 || end == std::string::npos || end + 1 == each.size()) {
            throw UsageError("--response: a delegate's identifier, \"=\" and a file are wanted: " + each);
        }
        responses.insert_or_assign(each.substr(0, end), readPropertyListFile(each.substr(end + 1)));
    }
    return responses;
}

} // namespace welcomer::tool
