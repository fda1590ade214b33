// What a property list in the XML format cannot hold, and where in a value it is.

#pragma once

#include "propertylist/PropertyList.h"

#include <optional>
#include <string>

namespace welcomer {

// Looks for what writeXMLPropertyList() refuses: a string or key that is no UTF-8 or holds a character that
// XML has no place for, a date that is outside the calendar's years or no number, nesting beyond
// kPropertyListMaximumDepth. Whoever takes a value that is to be written later asks this first, so that the
// value is refused by name where it enters.
//  value   only read during the call
//  result  none when the value can be written, else where and why, as one line of printable ASCII:
//          "delegates/org.example.notes/names/2 holds U+0001, for which XML has no place"
// Any thread.
std::optional<std::string> findUnwritableValue(const PropertyList& value);

// The same for what is to become an entry of a dictionary at the top of a property list.
std::optional<std::string> findUnwritableEntry(const std::string& key, const PropertyList& value);

} // namespace welcomer
