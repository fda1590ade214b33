#include "tools/welcomer/terminal/Printable.h"

#include "text/OneLine.h"
#include "tools/welcomer/terminal/UTF8Characters.h"

#include <cwchar>
#include <sys/ioctl.h>

namespace welcomer::tool {

namespace {

// Takes the first character away; bytes that are no UTF-8 count as they come.
std::string_view takeCharacter(std::string_view& text) {
    std::size_t length = 1;
    while (length < text.size() && (static_cast<unsigned char>(text[length]) & 0xc0) == 0x80) {
        ++length;
    }
    const std::string_view character = text.substr(0, length);
    text.remove_prefix(length);
    return character;
}

std::size_t widthOf(std::string_view character) {
    if (character.size() == 1) {
        return 1;
    }
    const UTF8Characters characters;
    wchar_t wide = 0;
    std::mbstate_t state{};
    const bool isRead = std::mbrtowc(&wide, character.data(), character.size(), &state) == character.size();
    const int width = isRead ? wcwidth(wide) : 1;
    return width < 0 ? 1 : static_cast<std::size_t>(width);
}

} // namespace

std::string printable(std::string_view text) {
    return text::oneLine(text);
}

std::size_t columns(std::string_view text) {
    std::size_t sum = 0;
    while (!text.empty()) {
        sum += widthOf(takeCharacter(text));
    }
    return sum;
}

std::string cutTo(std::string_view text, std::size_t width) {
    if (columns(text) <= width) {
        return std::string(text);
    }
    std::string kept;
    std::size_t room = width - 1; // for the mark
    while (!text.empty()) {
        const std::string_view character = takeCharacter(text);
        if (widthOf(character) > room) {
            break;
        }
        room -= widthOf(character);
        kept += character;
    }
    return kept + "…";
}

std::optional<std::size_t> terminalWidth(int descriptor) {
    winsize size{};
    const bool isKnown = ioctl(descriptor, TIOCGWINSZ, &size) == 0 && size.ws_col > 0;
    return isKnown ? std::optional<std::size_t>(size.ws_col) : std::nullopt;
}

} // namespace welcomer::tool
