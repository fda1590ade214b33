// Reading a property list in any of its formats.

#pragma once

#include "propertylist/PropertyList.h"

#include <optional>
#include <string>
#include <string_view>

namespace welcomer {

// How deep dictionaries and arrays may be nested, in reading and in writing; empty ones count like all
// others. A plug-in may build 512 levels (WL_VALUE_DEPTH_LIMIT). The rest is for what is wrapped around them:
// the account request and its answer have two levels more, the replay object three.
inline constexpr int kPropertyListMaximumDepth = 520;

// The value that was read, or why there is none.
struct PropertyListReadResult {
    std::optional<PropertyList> value; // none on failure
    std::string error;                 // what is wrong and where, on one line; empty on success

    explicit operator bool() const { return value.has_value(); }
};

// Reads a property list: the XML format, the binary format or the old-style text format, told apart by
// content. In all of them the last of several entries with the same key counts, and nothing but white space
// and comments may stand beside the one value. The headers of the single readers say what each accepts.
//  bytes   the whole property list; only read during the call
//  result  the value, or an error that says what and where: "line 3, column 14: ..." for the text formats,
//          "byte 14: ..." for the binary one. Never throws for bad input, and never follows a reference out
//          of `bytes`.
// Any thread.
PropertyListReadResult readPropertyList(std::string_view bytes);

} // namespace welcomer
