// Any bytes as the text of an item's attribute.

#pragma once

#include <string>
#include <string_view>

namespace welcomer::desktop {

// Texts of D-Bus are UTF-8 without null bytes. What is that stays as it is, so that people and other tools
// find it; the rest becomes base64 with a mark before it, and so does what begins with the mark itself. Any
// thread.
std::string attributeText(std::string_view bytes);

// The bytes that a text stands for. Any thread.
std::string bytesOfAttribute(std::string_view text);

} // namespace welcomer::desktop
