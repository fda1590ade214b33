// How a property-list value reads where a boolean or a number is wanted, whatever type it came as.

#pragma once

#include "propertylist/PropertyList.h"

#include <cstdint>
#include <optional>

namespace welcomer {

// A boolean as itself, a number as whether it differs from 0, a string as whether it is "yes" or "true" in
// any case or a number that differs from 0. Anything else, and no value, is false. Any thread.
bool booleanReading(const std::optional<PropertyList>& value);

// The number that a value is: an integer as itself, a real truncated towards 0, a boolean as 1 or 0, a string
// that is a decimal number from end to end as that number. What lies beyond 64 bits is the nearest end of
// their range. None for anything else, a real that is not a number among it: where a number decides about
// success, what is there and is none is a failure and not 0. Any thread.
std::optional<std::int64_t> integerIn(const PropertyList& value);

// The same, with 0 for what is no number and for no value. Any thread.
std::int64_t integerReading(const std::optional<PropertyList>& value);

} // namespace welcomer
