// Cutting text into words.

#pragma once

#include <algorithm>
#include <string_view>

namespace welcomer::server {

inline std::string_view withoutBlanks(std::string_view text) {
    constexpr std::string_view blanks = " \t\r";
    const std::size_t first = text.find_first_not_of(blanks);
    return first == std::string_view::npos ? std::string_view()
                                           : text.substr(first, text.find_last_not_of(blanks) - first + 1);
}

// Takes the part in front of a separator away, with the separator; all of it where there is none.
//  result  that part, without blanks around it
inline std::string_view takeUntil(std::string_view& text, char separator) {
    const std::size_t end = std::min(text.find(separator), text.size());
    const std::string_view part = text.substr(0, end);
    text.remove_prefix(std::min(end + 1, text.size()));
    return withoutBlanks(part);
}

} // namespace welcomer::server
