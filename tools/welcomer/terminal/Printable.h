// Text that comes from files and plug-ins, made fit for a terminal.

#pragma once

#include <string>
#include <string_view>

namespace welcomer::tool {

// The text on one line: control characters, which could move the cursor or end the line, become "\n", "\t" or
// "\x1b".
std::string printable(std::string_view text);

// How many columns a UTF-8 text takes on a terminal, counting each character as one.
std::size_t columns(std::string_view text);

} // namespace welcomer::tool
