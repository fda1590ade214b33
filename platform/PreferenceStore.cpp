#include "platform/PreferenceStore.h"

#include <algorithm>
#include <charconv>
#include <cmath>
#include <limits>
#include <string_view>

namespace welcomer::platform {

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

std::int64_t truncated(double real) {
    if (std::isnan(real)) {
        return 0;
    }
    // The highest 64-bit integer has no double of its own; the next power of two has.
    if (real >= -static_cast<double>(kLowest)) {
        return kHighest;
    }
    return real <= static_cast<double>(kLowest) ? kLowest : static_cast<std::int64_t>(real);
}

bool equalsInAnyCase(std::string_view text, std::string_view lower) {
    return std::ranges::equal(text, lower, [](char left, char right) {
        return (left >= 'A' && left <= 'Z' ? left - 'A' + 'a' : left) == right;
    });
}

} // namespace

bool booleanReading(const std::optional<PropertyList>& value) {
    if (!value) {
        return false;
    }
    if (const auto boolean = value->boolean()) {
        return *boolean;
    }
    std::optional<double> real = value->real();
    if (const std::string* text = value->string()) {
        if (equalsInAnyCase(*text, "yes") || equalsInAnyCase(*text, "true")) {
            return true;
        }
        real = realIn(*text);
    }
    return real ? std::abs(*real) > 0 : integerReading(value) != 0;
}

std::int64_t integerReading(const std::optional<PropertyList>& value) {
    if (!value) {
        return 0;
    }
    if (const auto integer = value->integer()) {
        return *integer;
    }
    if (value->unsignedInteger()) {
        return kHighest;
    }
    if (const auto real = value->real()) {
        return truncated(*real);
    }
    const std::string* text = value->string();
    if (!text) {
        return 0;
    }
    if (const auto integer = number<std::int64_t>(*text)) {
        return *integer;
    }
    return truncated(realIn(*text).value_or(0));
}

std::vector<std::optional<PropertyList>> PreferenceStore::copyValues(std::span<const std::string> keys,
                                                                     const std::string& domain) {
    std::vector<std::optional<PropertyList>> values;
    for (const std::string& key : keys) {
        values.push_back(copyValue(key, domain));
    }
    return values;
}

bool PreferenceStore::booleanDefault(const std::string& key) {
    return booleanReading(copyValue(key, kStandardDefaultsDomain));
}

std::int64_t PreferenceStore::integerDefault(const std::string& key) {
    return integerReading(copyValue(key, kStandardDefaultsDomain));
}

} // namespace welcomer::platform
