#include "plugins/PluginText.h"

#include "propertylist/UTF8.h"
#include "text/OneLine.h"

namespace welcomer {

namespace {

std::string asUTF8(std::string_view text) {
    std::string result;
    for (;;) {
        const std::size_t invalid = findInvalidUTF8(text);
        result += text.substr(0, invalid);
        if (invalid == std::string_view::npos) {
            return result;
        }
        appendUTF8(result, U'\uFFFD');
        text.remove_prefix(invalid + 1);
    }
}

} // namespace

std::string pluginText(std::string_view text) {
    return text::oneLine(asUTF8(text), kMaximumPluginText);
}

} // namespace welcomer
