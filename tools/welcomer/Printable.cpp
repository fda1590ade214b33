#include "tools/welcomer/Printable.h"

#include <algorithm>

namespace welcomer::tool {

namespace {

constexpr unsigned char kDelete = 0x7f;

void appendEscaped(std::string& result, unsigned char byte) {
    constexpr char digits[] = "0123456789abcdef";
    switch (byte) {
    case '\n':
        result += "\\n";
        break;
    case '\t':
        result += "\\t";
        break;
    default:
        result += {'\\', 'x', digits[byte >> 4], digits[byte & 15]};
    }
}

} // namespace

std::string printable(std::string_view text) {
    std::string result;
    result.reserve(text.size());
    for (std::size_t i = 0; i < text.size(); ++i) {
        const auto byte = static_cast<unsigned char>(text[i]);
        // U+0080 to U+009F are control characters too; in UTF-8 they are C2 80 to C2 9F.
        const bool secondControl = byte == 0xc2 && i + 1 < text.size() &&
                                   static_cast<unsigned char>(text[i + 1]) >= 0x80 &&
                                   static_cast<unsigned char>(text[i + 1]) <= 0x9f;
        if (secondControl) {
            appendEscaped(result, static_cast<unsigned char>(text[++i]));
        } else if (byte < ' ' || byte == kDelete) {
            appendEscaped(result, byte);
        } else {
            result += text[i];
        }
    }
    return result;
}

std::size_t columns(std::string_view text) {
    return static_cast<std::size_t>(std::count_if(text.begin(), text.end(), [](char byte) {
        return (static_cast<unsigned char>(byte) & 0xc0) != 0x80;
    }));
}

} // namespace welcomer::tool
