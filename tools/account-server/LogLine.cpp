#include "tools/account-server/LogLine.h"

#include "propertylist/Characters.h"
#include "text/OneLine.h"

#include <algorithm>

namespace welcomer::server {

namespace {

constexpr std::size_t kLongestValue = 256; // bytes

bool needsNoQuotes(char character) {
    constexpr std::string_view others = "-_.:/+@";
    return isLetterOrDigit(character) || others.find(character) != std::string_view::npos;
}

} // namespace

LogLine& LogLine::add(std::string_view name, std::string_view value) {
    _text.append(" ").append(name).append("=");
    if (!value.empty() && value.size() <= kLongestValue && std::ranges::all_of(value, needsNoQuotes)) {
        _text.append(value);
        return *this;
    }
    _text += '"';
    for (const char character : text::oneLine(value, kLongestValue)) {
        if (character == '"' || character == '\\') {
            _text += '\\';
        }
        _text += character;
    }
    _text += '"';
    return *this;
}

} // namespace welcomer::server
