// Reading a property list in any of its formats.

#pragma once

#include "propertylist/PropertyList.h"

#include <optional>
#include <string>
#include <string_view>

namespace welcomer {

// How deep dictionaries and arrays may be nested, in reading and in writing.
inline constexpr int kPropertyListMaximumDepth = 512;

// The value that was read, or why there is none.
struct PropertyListReadResult {
    std::optional<PropertyList> value; // none on failure
    std::string error;                 // what is wrong and where, on one line; empty on success

    explicit operator bool() const { return value.has_value(); }
};

// Reads a property list: the XML format, the binary format or the old-style text format, told apart by
// content.
//  bytes   the whole property list; only read during the call
//  result  the value, or an error that says what and where (line and column for the text formats, byte offset
//  for
//          the binary one). Never throws for bad input, and never follows a reference out of `bytes`.
// Any thread.
PropertyListReadResult readPropertyList(std::string_view bytes);

} // namespace welcomer
