// Text that comes from a plug-in.

#pragma once

#include <cstddef>
#include <string>
#include <string_view>

namespace welcomer {

// The longest text of a plug-in's that a log line holds, in bytes of UTF-8.
inline constexpr std::size_t kMaximumPluginText = 1024;

// The text as a log line may hold it: as UTF-8, where every byte that belongs to no character becomes U+FFFD,
// on one line of at most kMaximumPluginText bytes (text/OneLine.h). What the plug-in's text stands for, an
// identifier for instance, stays as it came wherever it is no message. Any thread.
std::string pluginText(std::string_view text);

} // namespace welcomer
