#include "tools/welcomer/terminal/Printable.h"

#include "text/OneLine.h"

#include <algorithm>

namespace welcomer::tool {

std::string printable(std::string_view text) {
    return text::oneLine(text);
}

std::size_t columns(std::string_view text) {
    return static_cast<std::size_t>(std::count_if(text.begin(), text.end(), [](char byte) {
        return (static_cast<unsigned char>(byte) & 0xc0) != 0x80;
    }));
}

} // namespace welcomer::tool
