#include "backends/desktop/credentials/AttributeText.h"

#include "propertylist/Base64.h"
#include "propertylist/UTF8.h"

namespace welcomer::desktop {

namespace {

constexpr std::string_view kMark = "base64:";

} // namespace

std::string attributeText(std::string_view bytes) {
    const bool isText =
        findInvalidUTF8(bytes) == std::string_view::npos && bytes.find('\0') == std::string_view::npos;
    if (isText && !bytes.starts_with(kMark)) {
        return std::string(bytes);
    }
    std::string text(kMark);
    appendBase64(text, bytes);
    return text;
}

std::string bytesOfAttribute(std::string_view text) {
    std::string bytes;
    if (text.starts_with(kMark) && decodeBase64(text.substr(kMark.size()), bytes) == std::string::npos) {
        return bytes;
    }
    return std::string(text);
}

} // namespace welcomer::desktop
