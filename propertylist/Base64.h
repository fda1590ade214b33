// Base64, the standard alphabet with padding.

#pragma once

#include <cstddef>
#include <string>
#include <string_view>

namespace welcomer {

// Appends the encoding of `bytes`, in one line.
void appendBase64(std::string& text, std::string_view bytes);

// Decodes `text`. White space may stand anywhere; the last group must be complete, with padding.
//  bytes   receives what was decoded; its content is unspecified on failure
//  result  npos on success, else the offset of the first character that does not belong (the size of `text`
//          when it ends within a group)
std::size_t decodeBase64(std::string_view text, std::string& bytes);

} // namespace welcomer
