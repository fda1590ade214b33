#include "propertylist/PropertyListReadError.h"

#include <algorithm>

namespace welcomer {

PropertyListReadResult failureAtLineAndColumn(std::string_view bytes, const PropertyListReadError& error) {
    constexpr std::string_view byteOrderMark = "\xEF\xBB\xBF";
    std::string_view before = bytes.substr(0, error.offset());
    if (before.starts_with(byteOrderMark)) {
        before.remove_prefix(byteOrderMark.size());
    }
    std::size_t line = 1;
    std::size_t column = 1;
    char previous = 0;
    for (const char character : before) {
        if (character == '\n' && previous == '\r') {
            // The second half of one line end.
        } else if (character == '\n' || character == '\r') {
            ++line;
            column = 1;
        } else if ((static_cast<unsigned char>(character) & 0xC0) != 0x80) {
            ++column;
        }
        previous = character;
    }
    return {std::nullopt,
            "line " + std::to_string(line) + ", column " + std::to_string(column) + ": " + error.what()};
}

PropertyListReadResult failureAtByteOffset(const PropertyListReadError& error) {
    return {std::nullopt, "byte " + std::to_string(error.offset()) + ": " + error.what()};
}

std::string excerpt(std::string_view text) {
    constexpr std::size_t longest = 40;
    std::string result(text.substr(0, longest));
    std::replace_if(
        result.begin(), result.end(), [](char c) { return c < 0x20 || c > 0x7E; }, '?');
    return text.size() > longest ? result + "..." : result;
}

} // namespace welcomer
