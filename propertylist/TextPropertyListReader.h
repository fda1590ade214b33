// Reading property lists in the old-style text format.

#pragma once

#include "propertylist/PropertyListReader.h"

#include <string_view>

namespace welcomer {

// Reads one old-style text property list, in UTF-8 with or without a byte order mark:
//  - {key = value; other = value;}    a dictionary; of entries with the same key the last one counts
//  - (value, value)                   an array; a comma may follow the last value
//  - word                             a string of letters, digits and the characters _ $ / : . -
//  - "text" or 'text'                 a string; \a \b \f \n \r \t \v, \ and the character itself, \101 (up
//                                     to three octal digits, the number of the character) and \U20ac (UTF-16
//                                     units in up to four hexadecimal digits) are its escapes
//  - <0fbd77 1c2735ae>                data
//  - key = value; other = value;      a dictionary too, at the top level only
// Comments are those of C and C++. The format has no other types: numbers, booleans and dates are strings.
// Errors carry line and column. Any thread; `bytes` is only read during the call.
PropertyListReadResult readTextPropertyList(std::string_view bytes);

} // namespace welcomer
