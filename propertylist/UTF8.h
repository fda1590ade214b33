// Checking and building UTF-8.

#pragma once

#include <cstddef>
#include <string>
#include <string_view>

namespace welcomer {

// The offset of the first byte that begins no well-formed UTF-8 sequence (overlong forms, surrogates and
// characters above U+10FFFF are malformed), or npos when all of `text` is UTF-8.
std::size_t findInvalidUTF8(std::string_view text);

// The same for the text of an XML document, which has no place for control characters other than tab, line
// feed and carriage return, nor for U+FFFE and U+FFFF: the offset of the first byte of what does not belong.
std::size_t findInvalidXMLText(std::string_view text);

// Says what findInvalidXMLText() found at `offset`: "invalid UTF-8" or the character, "U+0001".
std::string describeInvalidXMLText(std::string_view text, std::size_t offset);

// Whether an XML document may hold the character.
bool isXMLCharacter(char32_t character);

// Appends a character, which must be below U+110000 and no surrogate.
void appendUTF8(std::string& text, char32_t character);

// Whether a UTF-16 unit is the first, or the second, half of a surrogate pair.
constexpr bool isHighSurrogate(char32_t unit) {
    return unit >= 0xD800 && unit < 0xDC00;
}
constexpr bool isLowSurrogate(char32_t unit) {
    return unit >= 0xDC00 && unit < 0xE000;
}

// The character that a surrogate pair stands for.
constexpr char32_t joinSurrogates(char32_t high, char32_t low) {
    return 0x10000 + ((high - 0xD800) << 10) + (low - 0xDC00);
}

} // namespace welcomer
