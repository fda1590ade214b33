#include "backends/accountserver/Protocol.h"

#include <algorithm>

namespace welcomer::accountserver {

namespace {

char lowered(char character) {
    return character >= 'A' && character <= 'Z' ? static_cast<char>(character - 'A' + 'a') : character;
}

} // namespace

std::optional<ContentType> contentTypeNamed(std::string_view field) {
    constexpr std::string_view blanks = " \t";
    field = field.substr(0, field.find(';'));
    const std::size_t first = field.find_first_not_of(blanks);
    if (first == std::string_view::npos) {
        return std::nullopt;
    }
    field = field.substr(first, field.find_last_not_of(blanks) - first + 1);
    const auto is = [field](std::string_view name) {
        return std::ranges::equal(field, name, {}, lowered);
    };
    if (is(kJSONContentType) || is(kProblemContentType)) {
        return ContentType::JSON;
    }
    return is(kPropertyListContentType) ? std::optional(ContentType::PropertyList) : std::nullopt;
}

} // namespace welcomer::accountserver
