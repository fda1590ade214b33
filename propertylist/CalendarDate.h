// The calendar form of dates, as property lists in text form have it: 2001-02-03T04:05:06Z.

#pragma once

#include "propertylist/PropertyList.h"

#include <optional>
#include <string>
#include <string_view>

namespace welcomer {

// The date in ISO 8601 form, UTC, cut to whole seconds; none outside the years 0000 to 9999.
std::optional<std::string> formatCalendarDate(PropertyList::Date date);

// The moment that a text of exactly that form stands for, or none when it has another form or names a day or
// a time of day that does not exist.
std::optional<PropertyList::Date> parseCalendarDate(std::string_view text);

} // namespace welcomer
