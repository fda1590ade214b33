#include "propertylist/UTF8.h"

#include <algorithm>
#include <cstdio>

namespace welcomer {

namespace {

struct Sequence {
    char32_t character = 0;
    std::size_t length = 0; // in bytes; 0 when malformed
};

constexpr unsigned char byteAt(std::string_view text, std::size_t offset) {
    return static_cast<unsigned char>(text[offset]);
}

// Decodes the sequence at `offset`, which is below the size of `text`.
Sequence decode(std::string_view text, std::size_t offset) {
    const unsigned char first = byteAt(text, offset);
    if (first < 0x80) {
        return {first, 1};
    }
    Sequence sequence;
    char32_t smallest = 0;
    if (first >= 0xC2 && first < 0xE0) {
        sequence = {first & 0x1FU, 2};
        smallest = 0x80;
    } else if (first >= 0xE0 && first < 0xF0) {
        sequence = {first & 0x0FU, 3};
        smallest = 0x800;
    } else if (first >= 0xF0 && first < 0xF5) {
        sequence = {first & 0x07U, 4};
        smallest = 0x10000;
    } else {
        return {};
    }
    if (text.size() - offset < sequence.length) {
        return {};
    }
    for (std::size_t index = 1; index < sequence.length; ++index) {
        const unsigned char next = byteAt(text, offset + index);
        if ((next & 0xC0) != 0x80) {
            return {};
        }
        sequence.character = sequence.character << 6 | (next & 0x3FU);
    }
    const bool isSurrogate = sequence.character >= 0xD800 && sequence.character < 0xE000;
    if (sequence.character < smallest || sequence.character > 0x10FFFF || isSurrogate) {
        return {};
    }
    return sequence;
}

template <bool forXML>
constexpr bool isPlain(unsigned char byte) {
    return byte < 0x80 && (!forXML || byte >= 0x20 || byte == '\t' || byte == '\n' || byte == '\r');
}

// Most text is plain ASCII, so whole blocks of it are passed over with a loop that compilers vectorise.
constexpr std::size_t kBlockSize = 64;

template <bool forXML>
bool isPlainBlock(const char* block) {
    unsigned char special = 0;
    for (std::size_t index = 0; index < kBlockSize; ++index) {
        const auto byte = static_cast<unsigned char>(block[index]);
        special |= static_cast<unsigned char>(byte & 0x80);
        if constexpr (forXML) {
            const int isWhiteSpace = (byte == '\t') | (byte == '\n') | (byte == '\r');
            special |= static_cast<unsigned char>((byte < 0x20) & (isWhiteSpace ^ 1));
        }
    }
    return special == 0;
}

template <bool forXML>
std::size_t findInvalid(std::string_view text) {
    std::size_t offset = 0;
    while (offset < text.size()) {
        while (text.size() - offset >= kBlockSize && isPlainBlock<forXML>(text.data() + offset)) {
            offset += kBlockSize;
        }
        const std::size_t blockEnd = std::min(text.size(), offset + kBlockSize);
        while (offset < blockEnd) {
            if (isPlain<forXML>(byteAt(text, offset))) {
                ++offset;
                continue;
            }
            const Sequence sequence = decode(text, offset);
            if (sequence.length == 0 || (forXML && !isXMLCharacter(sequence.character))) {
                return offset;
            }
            offset += sequence.length;
        }
    }
    return std::string_view::npos;
}

} // namespace

std::size_t findInvalidUTF8(std::string_view text) {
    return findInvalid<false>(text);
}

std::size_t findInvalidXMLText(std::string_view text) {
    return findInvalid<true>(text);
}

std::string describeInvalidXMLText(std::string_view text, std::size_t offset) {
    const Sequence sequence = decode(text, offset);
    if (sequence.length == 0) {
        return "invalid UTF-8";
    }
    char name[16];
    std::snprintf(name, sizeof name, "U+%04X", static_cast<unsigned>(sequence.character));
    return name;
}

bool isXMLCharacter(char32_t character) {
    if (character < 0x20) {
        return character == '\t' || character == '\n' || character == '\r';
    }
    return character < 0xD800 || (character >= 0xE000 && character < 0xFFFE) ||
           (character >= 0x10000 && character <= 0x10FFFF);
}

void appendUTF8(std::string& text, char32_t character) {
    const auto continuation = [character](unsigned shift) {
        return static_cast<char>(0x80 | (character >> shift & 0x3F));
    };
    if (character < 0x80) {
        text += static_cast<char>(character);
    } else if (character < 0x800) {
        text += static_cast<char>(0xC0 | character >> 6);
        text += continuation(0);
    } else if (character < 0x10000) {
        text += static_cast<char>(0xE0 | character >> 12);
        text += continuation(6);
        text += continuation(0);
    } else {
        text += static_cast<char>(0xF0 | character >> 18);
        text += continuation(12);
        text += continuation(6);
        text += continuation(0);
    }
}

} // namespace welcomer
