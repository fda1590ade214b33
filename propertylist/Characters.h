// What is asked of single ASCII characters and of texts in any case.

#pragma once

#include <algorithm>
#include <string>
#include <string_view>

namespace welcomer {

// Each of a character alone, whatever the locale. Any thread.
constexpr char toLower(char character) {
    return character >= 'A' && character <= 'Z' ? static_cast<char>(character - 'A' + 'a') : character;
}

constexpr bool isLetterOrDigit(char character) {
    const char lower = toLower(character);
    return (lower >= 'a' && lower <= 'z') || (character >= '0' && character <= '9');
}

// Whether a text is another one, which is given in lower case, whatever the case of its letters.
constexpr bool equalsIgnoringCase(std::string_view text, std::string_view lowerCase) {
    return std::ranges::equal(text, lowerCase, {}, toLower);
}

inline constexpr char kHexDigits[] = "0123456789abcdef";

// Appends a byte as its two hexadecimal digits.
inline void appendHex(std::string& text, unsigned char byte) {
    text += kHexDigits[byte >> 4];
    text += kHexDigits[byte & 15];
}

} // namespace welcomer
