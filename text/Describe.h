// How a value looks in a message, where the format says %@.
//
// A type of another folder takes part by offering a function `std::string describe(const T&)` in its own
// namespace.

#pragma once

#include "propertylist/PropertyList.h"

#include <concepts>
#include <cstdint>
#include <exception>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace welcomer::text {

// Strings as they stand, a null pointer as "(null)".
std::string describe(std::string_view value);
std::string describe(const char* value);

// Numbers in decimal, reals in the shortest form that reads back to the same bits, a boolean as 1 or 0.
std::string describe(std::same_as<bool> auto value) {
    return value ? "1" : "0"; // a template, so that no pointer turns into a boolean on its way here
}
std::string describe(std::int64_t value);
std::string describe(std::uint64_t value);
std::string describe(double value);

// An exception as its text. What is no std::exception has none and says so; a null pointer is "(null)".
std::string describe(const std::exception& value);
std::string describe(const std::exception_ptr& value);

// Data as <hex>, a date in ISO 8601 UTC, an array as (a, b), a dictionary as {key = value; other = (1, 2)},
// with the texts inside them on one line (text/OneLine.h).
std::string describe(const PropertyList& value);

// Every integer type; a boolean is none.
template <class T>
concept Integer = std::integral<T> && !std::same_as<T, bool>;

std::string describe(Integer auto value) {
    if constexpr (std::signed_integral<decltype(value)>) {
        return describe(static_cast<std::int64_t>(value));
    } else {
        return describe(static_cast<std::uint64_t>(value));
    }
}

inline std::string describe(const std::string& value) {
    return value;
}

inline std::string describe(const std::vector<std::string>& value) {
    return describe(PropertyList(PropertyList::Array(value.begin(), value.end())));
}

// None as "(null)".
template <class T>
std::string describe(const std::optional<T>& value) {
    return value ? describe(*value) : std::string("(null)");
}

} // namespace welcomer::text
