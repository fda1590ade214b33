#include "propertylist/PropertyListReadings.h"

#include "propertylist/Characters.h"

#include <charconv>
#include <cmath>
#include <limits>
#include <string_view>

namespace welcomer {

namespace {

constexpr std::int64_t kLowest = std::numeric_limits<std::int64_t>::min();
constexpr std::int64_t kHighest = std::numeric_limits<std::int64_t>::max();

// The number that the whole text is, or none.
template <class Number>
std::optional<Number> number(std::string_view text) {
    Number value{};
    const char* const end = text.data() + text.size();
    const auto [rest, error] = std::from_chars(text.data(), end, value);
    return error == std::errc() && rest == end ? std::optional(value) : std::nullopt;
}

// The same for a real; "inf" and "nan" are no decimal numbers.
std::optional<double> realIn(std::string_view text) {
    const auto real = number<double>(text);
    return real && std::isfinite(*real) ? real : std::nullopt;
}

std::optional<std::int64_t> truncated(std::optional<double> real) {
    if (!real || std::isnan(*real)) {
        return std::nullopt;
    }
    // The highest 64-bit integer has no double of its own; the next power of two has.
    if (*real >= -static_cast<double>(kLowest)) {
        return kHighest;
    }
    return *real <= static_cast<double>(kLowest) ? kLowest : static_cast<std::int64_t>(*real);
}

} // namespace

bool booleanReading(const std::optional<PropertyList>& value) {
    if (!value) {
        return false;
    }
    std::optional<double> real = value->real();
    if (const std::string* text = value->string()) {
        if (equalsIgnoringCase(*text, "yes") || equalsIgnoringCase(*text, "true")) {
            return true;
        }
        real = realIn(*text);
    }
    return real ? std::abs(*real) > 0 : integerReading(value) != 0;
}

std::optional<std::int64_t> integerIn(const PropertyList& value) {
    if (const auto boolean = value.boolean()) {
        return *boolean ? 1 : 0;
    }
    if (const auto integer = value.integer()) {
        return integer;
    }
    if (value.unsignedInteger()) {
        return kHighest;
    }
    const std::string* text = value.string();
    if (!text) {
        return truncated(value.real());
    }
    const auto integer = number<std::int64_t>(*text);
    return integer ? integer : truncated(realIn(*text));
}

std::int64_t integerReading(const std::optional<PropertyList>& value) {
    return value ? integerIn(*value).value_or(0) : 0;
}

} // namespace welcomer
