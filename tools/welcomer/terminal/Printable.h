// Text that comes from files and plug-ins, made fit for a terminal.

#pragma once

#include <optional>
#include <string>
#include <string_view>

namespace welcomer::tool {

// The text on one line: control characters, which could move the cursor or end the line, become "\n", "\t" or
// "\x1b".
std::string printable(std::string_view text);

// How many columns a UTF-8 text takes on a terminal: one for each character, two for a wide one.
std::size_t columns(std::string_view text);

// The text, cut so that it takes no more columns than that; what was cut ends in "…".
//  width  at least 1
std::string cutTo(std::string_view text, std::size_t width);

// How many columns a terminal has; none where the descriptor is no terminal, or where that is not known.
std::optional<std::size_t> terminalWidth(int descriptor);

} // namespace welcomer::tool
