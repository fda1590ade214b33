// Text that comes from a plug-in.

#pragma once

#include <string>
#include <string_view>

namespace welcomer {

// The text as UTF-8: every byte that belongs to no character becomes U+FFFD. Any thread.
std::string pluginText(std::string_view text);

} // namespace welcomer
