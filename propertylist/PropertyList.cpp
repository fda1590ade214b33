#include "propertylist/PropertyList.h"

#include <array>

namespace welcomer {

PropertyList::PropertyList() = default;
PropertyList::PropertyList(const PropertyList& other) = default;
PropertyList::PropertyList(PropertyList&& other) noexcept = default;
PropertyList& PropertyList::operator=(const PropertyList& other) = default;
PropertyList& PropertyList::operator=(PropertyList&& other) noexcept = default;
PropertyList::~PropertyList() = default;

bool operator==(const PropertyList& one, const PropertyList& other) {
    return one._value == other._value;
}

PropertyList::Type PropertyList::type() const {
    // In the order of the variant's alternatives.
    static constexpr std::array types{Type::Dictionary, Type::Array,   Type::String,
                                      Type::Integer,    Type::Integer, Type::Real,
                                      Type::Boolean,    Type::Data,    Type::Date};
    return types[_value.index()];
}

std::optional<bool> PropertyList::boolean() const {
    const bool* value = std::get_if<bool>(&_value);
    return value ? std::optional(*value) : std::nullopt;
}

std::optional<std::int64_t> PropertyList::integer() const {
    const std::int64_t* value = std::get_if<std::int64_t>(&_value);
    return value ? std::optional(*value) : std::nullopt;
}

std::optional<std::uint64_t> PropertyList::unsignedInteger() const {
    if (const std::uint64_t* value = std::get_if<std::uint64_t>(&_value)) {
        return *value;
    }
    const std::int64_t* value = std::get_if<std::int64_t>(&_value);
    return value && *value >= 0 ? std::optional(static_cast<std::uint64_t>(*value)) : std::nullopt;
}

std::optional<double> PropertyList::real() const {
    const double* value = std::get_if<double>(&_value);
    return value ? std::optional(*value) : std::nullopt;
}

const PropertyList* PropertyList::find(std::string_view key) const {
    const Dictionary* entries = dictionary();
    if (!entries) {
        return nullptr;
    }
    const auto entry = entries->find(key);
    return entry == entries->end() ? nullptr : &entry->second;
}

} // namespace welcomer
