#include "plugins/HostExtensions.h"

#include <string_view>

namespace welcomer {

const void* hostExtension(const char* identifier) noexcept {
    const std::string_view asked = identifier ? identifier : "";
    if (asked == WL_EXTENSION_LOG) {
        return &logExtension();
    }
    if (asked == WL_EXTENSION_CONTEXT) {
        return &contextExtension();
    }
    if (asked == WL_EXTENSION_PROGRESS) {
        return &progressExtension();
    }
    if (asked == WL_EXTENSION_DISPATCH) {
        return &dispatchExtension();
    }
    return nullptr;
}

} // namespace welcomer
