// Reading property lists in the XML format.

#pragma once

#include "propertylist/PropertyListReader.h"

#include <string_view>

namespace welcomer {

// Reads one XML property list: UTF-8, with or without a byte order mark; the top element is <plist> with
// exactly one value in it.
//  - Comments and processing instructions are passed over wherever XML allows them; CDATA sections count as
//    text. Attributes must be well formed and are otherwise ignored.
//  - References are the five predefined entities and characters by number; nothing else is ever expanded.
//  - A document type declaration is passed over; one with an internal subset is refused.
//  - Of entries with the same key the last one counts.
//  - Integers are decimal or, with 0x, hexadecimal, and fit 64 bits, signed or unsigned.
// Errors carry line and column. Any thread; `bytes` is only read during the call.
PropertyListReadResult readXMLPropertyList(std::string_view bytes);

// The same, but entries with the same key are refused: for what somebody else may have read otherwise on its way.
PropertyListReadResult readXMLPropertyListWithUniqueKeys(std::string_view bytes);

} // namespace welcomer
