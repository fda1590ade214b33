// Text from elsewhere on one line of bounded length.

#pragma once

#include <cstddef>
#include <string>
#include <string_view>

namespace welcomer::text {

// The text without what could end a line or steer a terminal: the control characters U+0000 to U+001F and
// U+007F to U+009F become "\n", "\t" or "\x1b", the separators U+2028 and U+2029 "\u{2028}" and "\u{2029}".
// All other bytes stay as they are, backslashes too.
//  limit  how many bytes the result may have; a longer one ends in "…", which counts, and is cut where a
//         character or an escape ends. At least the length of "…".
// Any thread.
std::string oneLine(std::string_view text, std::size_t limit = std::string_view::npos);

} // namespace welcomer::text
