#include "text/OneLine.h"

#include "propertylist/Characters.h"

namespace welcomer::text {

namespace {

constexpr std::string_view kEllipsis = "…";
constexpr unsigned char kDelete = 0x7f;
constexpr std::string_view kSecondControlsLead = "\xc2"; // U+0080 to U+009F are C2 80 to C2 9F in UTF-8
constexpr std::string_view kLineSeparator = "\u2028";
constexpr std::string_view kParagraphSeparator = "\u2029";

bool isContinuation(char byte) {
    return (static_cast<unsigned char>(byte) & 0xc0) == 0x80;
}

// How many bytes the first character has; bytes that are no UTF-8 count as they come.
std::size_t lengthOfFirst(std::string_view text) {
    constexpr std::size_t kLongest = 4;
    std::size_t length = 1;
    while (length < kLongest && length < text.size() && isContinuation(text[length])) {
        ++length;
    }
    return length;
}

void appendEscaped(std::string& line, unsigned char control) {
    switch (control) {
    case '\n':
        line += "\\n";
        break;
    case '\t':
        line += "\\t";
        break;
    default:
        line += "\\x";
        appendHex(line, control);
    }
}

void appendCharacter(std::string& line, std::string_view character) {
    const auto first = static_cast<unsigned char>(character.front());
    const auto last = static_cast<unsigned char>(character.back());
    if (first < ' ' || first == kDelete) {
        appendEscaped(line, first);
        line += character.substr(1);
    } else if (character.size() == 2 && character.starts_with(kSecondControlsLead) && last < 0xa0) {
        appendEscaped(line, last);
    } else if (character == kLineSeparator) {
        line += "\\u{2028}";
    } else if (character == kParagraphSeparator) {
        line += "\\u{2029}";
    } else {
        line += character;
    }
}

} // namespace

std::string oneLine(std::string_view text, std::size_t limit) {
    std::string line;
    std::size_t fits = 0; // how much of the line leaves room for the ellipsis
    while (!text.empty()) {
        const std::size_t length = lengthOfFirst(text);
        appendCharacter(line, text.substr(0, length));
        text.remove_prefix(length);
        if (line.size() > limit) {
            line.resize(fits);
            return line += kEllipsis;
        }
        if (limit - line.size() >= kEllipsis.size()) {
            fits = line.size();
        }
    }
    return line;
}

} // namespace welcomer::text
