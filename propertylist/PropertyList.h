// The value type of the whole system: what preferences, the replay item, requests and responses are made of.

#pragma once

#include <compare>
#include <concepts>
#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <variant>
#include <vector>

namespace welcomer {

// Every integer type that fits 64 bits, signed or unsigned; a boolean and a character are none.
template <class T>
concept PropertyListInteger = std::integral<T> && !std::same_as<T, bool> && !std::same_as<T, char>;

// A property-list value: a dictionary, array, string, integer, real, boolean, data or date. It is a plain
// value: copying copies everything below it, moving is cheap. Booleans are kept apart from integers, and
// integers from reals. No operation blocks, and distinct values may be used on distinct threads.
class PropertyList {
  public:
    using Array = std::vector<PropertyList>;

    // Iterates in key order, so that output is the same from run to run.
    using Dictionary = std::map<std::string, PropertyList, std::less<>>;

    // Raw bytes. A type of its own, so that bytes and text are never mistaken for one another.
    struct Data {
        std::string bytes;
        friend bool operator==(const Data&, const Data&) = default;
    };

    // A moment in UTC, in seconds since 1970-01-01T00:00:00Z. The XML format keeps whole seconds only.
    struct Date {
        double secondsSince1970 = 0;
        friend bool operator==(const Date&, const Date&) = default;
    };

    enum class Type { Dictionary, Array, String, Integer, Real, Boolean, Data, Date };

    // An empty dictionary.
    PropertyList();

    // Not where they are declared: what a variant of nine types does then is the greater part of compiling whoever has values.
    PropertyList(const PropertyList& other);
    PropertyList(PropertyList&& other) noexcept;
    PropertyList& operator=(const PropertyList& other);
    PropertyList& operator=(PropertyList&& other) noexcept;
    ~PropertyList();

    PropertyList(Dictionary value) : _value(std::move(value)) {}
    PropertyList(Array value) : _value(std::move(value)) {}
    PropertyList(std::string value) : _value(std::move(value)) {}
    PropertyList(std::string_view value) : _value(std::string(value)) {}
    PropertyList(const char* value) : _value(std::string(value)) {}
    PropertyList(Data value) : _value(std::move(value)) {}
    PropertyList(Date value) : _value(value) {}
    PropertyList(std::same_as<bool> auto value) : _value(value) {}
    PropertyList(std::floating_point auto value) : _value(static_cast<double>(value)) {}

    // Equal numbers are equal values, whatever the C++ type.
    PropertyList(PropertyListInteger auto value) {
        if (std::in_range<std::int64_t>(value)) {
            _value = static_cast<std::int64_t>(value);
        } else {
            _value = static_cast<std::uint64_t>(value);
        }
    }

    Type type() const;
    bool isDictionary() const { return std::holds_alternative<Dictionary>(_value); }
    bool isArray() const { return std::holds_alternative<Array>(_value); }
    bool isString() const { return std::holds_alternative<std::string>(_value); }

    // Each gives the content when the value is of that type, else null. The pointer is borrowed: it lives as
    // long as this value stays unchanged.
    const Dictionary* dictionary() const { return std::get_if<Dictionary>(&_value); }
    Dictionary* dictionary() { return std::get_if<Dictionary>(&_value); }
    const Array* array() const { return std::get_if<Array>(&_value); }
    Array* array() { return std::get_if<Array>(&_value); }
    const std::string* string() const { return std::get_if<std::string>(&_value); }
    std::string* string() { return std::get_if<std::string>(&_value); }
    const Data* data() const { return std::get_if<Data>(&_value); }
    Data* data() { return std::get_if<Data>(&_value); }
    const Date* date() const { return std::get_if<Date>(&_value); }

    // Each gives the content when the value is of exactly that type, else none: a boolean is no integer and
    // an integer no real.
    std::optional<bool> boolean() const;
    // None also when the integer does not fit the result.
    std::optional<std::int64_t> integer() const;
    std::optional<std::uint64_t> unsignedInteger() const;
    std::optional<double> real() const;

    // The entry of a dictionary, or null when there is none or this value is no dictionary. Borrowed, as
    // above.
    const PropertyList* find(std::string_view key) const;

    friend bool operator==(const PropertyList& one, const PropertyList& other);

  private:
    // An integer is held unsigned only when it is above the signed range.
    std::variant<Dictionary, Array, std::string, std::int64_t, std::uint64_t, double, bool, Data, Date>
        _value;
};

} // namespace welcomer
