#include "text/Describe.h"

#include "propertylist/CalendarDate.h"
#include "propertylist/Characters.h"
#include "text/OneLine.h"

#include <array>
#include <charconv>

namespace welcomer::text {

namespace {

constexpr std::string_view kNone = "(null)";

// Longest decimal 64-bit integer or shortest-form double: 24 characters.
template <class Number>
std::string toDecimal(Number value) {
    std::array<char, 32> buffer{};
    const auto end = std::to_chars(buffer.data(), buffer.data() + buffer.size(), value);
    return {buffer.data(), end.ptr};
}

std::string describeData(const PropertyList::Data& data) {
    std::string text = "<";
    text.reserve(data.bytes.size() * 2 + 2);
    for (const char c : data.bytes) {
        appendHex(text, static_cast<unsigned char>(c));
    }
    return text += '>';
}

std::string describeDate(PropertyList::Date date) {
    // Outside the calendar's years there is no ISO 8601 form to speak of; the number says more.
    return formatCalendarDate(date).value_or(toDecimal(date.secondsSince1970));
}

// A value inside another one: its text is no line of its own, and whoever wrote it must not end the line.
std::string describeInside(const PropertyList& value) {
    return value.string() ? oneLine(*value.string()) : describe(value);
}

std::string describeArray(const PropertyList::Array& array) {
    std::string text = "(";
    std::string_view separator;
    for (const PropertyList& element : array) {
        text.append(separator).append(describeInside(element));
        separator = ", ";
    }
    return text += ')';
}

std::string describeDictionary(const PropertyList::Dictionary& dictionary) {
    std::string text = "{";
    std::string_view separator;
    for (const auto& [key, value] : dictionary) {
        text.append(separator).append(oneLine(key)).append(" = ").append(describeInside(value));
        separator = "; ";
    }
    return text += '}';
}

} // namespace

std::string describe(std::string_view value) {
    return std::string(value);
}

std::string describe(const char* value) {
    return std::string(value ? std::string_view(value) : kNone);
}

std::string describe(std::int64_t value) {
    return toDecimal(value);
}

std::string describe(std::uint64_t value) {
    return toDecimal(value);
}

std::string describe(double value) {
    return toDecimal(value);
}

std::string describe(const std::exception& value) {
    return value.what();
}

std::string describe(const std::exception_ptr& value) {
    if (!value) {
        return std::string(kNone);
    }
    try {
        std::rethrow_exception(value);
    } catch (const std::exception& exception) {
        return describe(exception);
    } catch (...) {
        return "unknown exception";
    }
}

std::string describe(const PropertyList& value) {
    switch (value.type()) {
    case PropertyList::Type::Dictionary:
        return describeDictionary(*value.dictionary());
    case PropertyList::Type::Array:
        return describeArray(*value.array());
    case PropertyList::Type::String:
        return *value.string();
    case PropertyList::Type::Integer:
        return value.integer() ? describe(*value.integer()) : describe(*value.unsignedInteger());
    case PropertyList::Type::Real:
        return describe(*value.real());
    case PropertyList::Type::Boolean:
        return describe(*value.boolean());
    case PropertyList::Type::Data:
        return describeData(*value.data());
    case PropertyList::Type::Date:
        return describeDate(*value.date());
    }
    return {};
}

} // namespace welcomer::text
