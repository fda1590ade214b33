// Writing a property list in the XML format, version 1.0.

#pragma once

#include "propertylist/PropertyList.h"

#include <optional>
#include <string>

namespace welcomer {

// Serialises a value in the XML format, version 1.0. Reals read back to the same bits; a date is cut to whole
// seconds.
//  value   the value; only read during the call
//  error   where to say what cannot be written and why, or null
//  result  the bytes, or none when the value cannot be written; UnwritableValue.h says what that is, and
//          finds it beforehand
// Any thread.
std::optional<std::string> writeXMLPropertyList(const PropertyList& value, std::string* error = nullptr);

} // namespace welcomer
