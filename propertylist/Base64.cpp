#include "propertylist/Base64.h"

#include <array>
#include <cstdint>
#include <cstring>

namespace welcomer {

namespace {

constexpr std::string_view kAlphabet = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";

// Two characters for each value of 12 bits, so that three bytes take two look-ups.
constexpr auto kPairs = [] {
    std::array<std::array<char, 2>, 4096> pairs{};
    for (std::size_t value = 0; value < pairs.size(); ++value) {
        pairs[value] = {kAlphabet[value >> 6], kAlphabet[value & 63]};
    }
    return pairs;
}();

constexpr std::uint32_t kNoDigit = 0x80000000;

// For each place in a group, the 6 bits of each character where they stand in the 24 bits of the group.
constexpr auto kDigits = [] {
    std::array<std::array<std::uint32_t, 256>, 4> digits{};
    for (std::size_t place = 0; place < 4; ++place) {
        digits[place].fill(kNoDigit);
        for (std::uint32_t value = 0; value < 64; ++value) {
            digits[place][static_cast<unsigned char>(kAlphabet[value])] = value << (18 - 6 * place);
        }
    }
    return digits;
}();

constexpr bool isWhiteSpace(char character) {
    return character == ' ' || character == '\t' || character == '\n' || character == '\r';
}

// The 24 bits of the group at `text`, or a value with kNoDigit set when one of the characters is no digit.
inline std::uint32_t decodeGroup(const char* text) {
    const auto* digits = reinterpret_cast<const unsigned char*>(text);
    return kDigits[0][digits[0]] | kDigits[1][digits[1]] | kDigits[2][digits[2]] | kDigits[3][digits[3]];
}

inline void storeGroup(char* bytes, std::uint32_t group) {
    bytes[0] = static_cast<char>(group >> 16);
    bytes[1] = static_cast<char>(group >> 8);
    bytes[2] = static_cast<char>(group);
}

// Decodes whole groups of digits alone, for as long as there are any. Moves `input` and `output` past them.
void decodeGroups(const char*& input, const char* end, char*& output) {
    for (; end - input >= 4; input += 4, output += 3) {
        const std::uint32_t value = decodeGroup(input);
        if (value & kNoDigit) {
            return;
        }
        storeGroup(output, value);
    }
}

} // namespace

void appendBase64(std::string& text, std::string_view bytes) {
    const std::size_t start = text.size();
    text.resize(start + (bytes.size() + 2) / 3 * 4);
    char* output = text.data() + start;
    const auto* input = reinterpret_cast<const unsigned char*>(bytes.data());
    std::size_t left = bytes.size();
    for (; left >= 3; left -= 3, input += 3, output += 4) {
        const std::uint32_t group = std::uint32_t{input[0]} << 16 | std::uint32_t{input[1]} << 8 | input[2];
        std::memcpy(output, kPairs[group >> 12].data(), 2);
        std::memcpy(output + 2, kPairs[group & 0xFFF].data(), 2);
    }
    if (left == 0) {
        return;
    }
    const std::uint32_t group =
        std::uint32_t{input[0]} << 16 | (left == 2 ? std::uint32_t{input[1]} << 8 : 0);
    std::memcpy(output, kPairs[group >> 12].data(), 2);
    output[2] = left == 2 ? kAlphabet[group >> 6 & 63] : '=';
    output[3] = '=';
}

std::size_t decodeBase64(std::string_view text, std::string& bytes) {
    bytes.resize(text.size() / 4 * 3 + 3);
    char* output = bytes.data();
    const char* input = text.data();
    const char* const end = input + text.size();

    std::array<char, 4> group{};
    std::size_t gathered = 0; // characters in `group`
    std::size_t padding = 0;
    while (input != end) {
        if (gathered == 0 && padding == 0) {
            decodeGroups(input, end, output);
            if (input == end) {
                break;
            }
        }
        // White space, padding or the end is near: one character at a time.
        const char character = *input;
        if (isWhiteSpace(character)) {
            ++input;
            continue;
        }
        if (character == '=' && gathered >= 2 && gathered + padding < 4) {
            ++padding;
        } else if (padding == 0 && !(kDigits[0][static_cast<unsigned char>(character)] & kNoDigit)) {
            group[gathered++] = character;
        } else {
            return static_cast<std::size_t>(input - text.data());
        }
        ++input;
        if (gathered == 4) {
            storeGroup(output, decodeGroup(group.data()));
            output += 3;
            gathered = 0;
        }
    }
    if (gathered != 0) {
        if (gathered + padding != 4) {
            return text.size();
        }
        for (std::size_t place = gathered; place < 4; ++place) {
            group[place] = kAlphabet[0];
        }
        storeGroup(output, decodeGroup(group.data()));
        output += gathered - 1;
    }
    bytes.resize(static_cast<std::size_t>(output - bytes.data()));
    return std::string_view::npos;
}

} // namespace welcomer
