#include "tools/welcomer/plugins/CheckReport.h"

#include "tools/welcomer/cli/PropertyListOutput.h"

namespace welcomer::tool {

void CheckReport::_send(const char* kind, const std::string& text) {
    const Json record = {{"kind", kind}, {"text", text}};
    _tell(record.dump(-1, ' ', false, Json::error_handler_t::replace));
}

} // namespace welcomer::tool
