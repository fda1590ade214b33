// The help of the command line, as it fits on a terminal.

#pragma once

#include <cstddef>
#include <optional>
#include <string>

namespace welcomer::tool {

// The column at which the descriptions in a help text begin.
inline constexpr std::size_t kHelpColumn = 30;

// Breaks the lines of a help text between words. A description goes on below its beginning where there is room
// for that.
//  text   of one-column characters
//  width  of the terminal, in columns; none: nothing is broken
std::string wrapHelp(const std::string& text, std::optional<std::size_t> width);

} // namespace welcomer::tool
