// Reading property lists in the binary format.

#pragma once

#include "propertylist/PropertyListReader.h"

#include <string_view>

namespace welcomer {

// What every binary property list begins with; the two digits of its version follow.
inline constexpr std::string_view kBinaryPropertyListMagic = "bplist";

// Reads one binary property list, version 00.
//  - Integers have 1, 2, 4, 8 or 16 bytes and must fit 64 bits, signed or unsigned; reals 4 or 8.
//  - Strings are ASCII or UTF-16. Keys are strings; of entries with the same key the last one counts.
//  - Null, fill, set, URL, UUID and UID objects are no property-list values here and are refused.
//  - Objects may be shared, but may not contain themselves, and all together they may not make more than
//    65,536 values beyond one for every byte of the input, nor more than 64 MiB of text and data beyond 16
//    times its size.
// Errors carry the byte offset. Any thread; `bytes` is only read during the call.
PropertyListReadResult readBinaryPropertyList(std::string_view bytes);

} // namespace welcomer
