// Typed look-ups in property lists: what stands under a key, as what it is wanted as.

#pragma once

#include "propertylist/PropertyList.h"

#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace welcomer {

// A place to look into is a dictionary, a value, or a pointer to either; a value that is no dictionary and a
// null pointer hold nothing. What is found is borrowed, and as const as its place. Any thread.

// What stands under a key, or null.
inline const PropertyList* valueIn(const PropertyList::Dictionary& place, std::string_view key) {
    const auto found = place.find(key);
    return found == place.end() ? nullptr : &found->second;
}
inline PropertyList* valueIn(PropertyList::Dictionary& place, std::string_view key) {
    const auto found = place.find(key);
    return found == place.end() ? nullptr : &found->second;
}
inline const PropertyList* valueIn(const PropertyList& place, std::string_view key) {
    return place.find(key);
}
template <class Place>
auto valueIn(Place* place, std::string_view key) {
    return place ? valueIn(*place, key) : nullptr;
}

// The same where it is a text, an array or a dictionary; else null.
template <class Place>
auto textIn(Place&& place, std::string_view key) {
    auto* const value = valueIn(place, key);
    return value ? value->string() : nullptr;
}
template <class Place>
auto arrayIn(Place&& place, std::string_view key) {
    auto* const value = valueIn(place, key);
    return value ? value->array() : nullptr;
}
template <class Place>
auto dictionaryIn(Place&& place, std::string_view key) {
    auto* const value = valueIn(place, key);
    return value ? value->dictionary() : nullptr;
}

// The texts of an array, in order; what is no text is left out. None when there is no array.
template <class Place>
std::optional<std::vector<std::string>> textsIn(const Place& place, std::string_view key) {
    const PropertyList::Array* const array = arrayIn(place, key);
    if (!array) {
        return std::nullopt;
    }
    std::vector<std::string> texts;
    for (const PropertyList& each : *array) {
        if (const std::string* text = each.string()) {
            texts.push_back(*text);
        }
    }
    return texts;
}

// Whether the boolean true stands there.
template <class Place>
bool isTrueIn(const Place& place, std::string_view key) {
    const PropertyList* const value = valueIn(place, key);
    return value && value->boolean().value_or(false);
}

// What was found as a value of its own, or none.
template <class Found>
std::optional<Found> copyOf(const Found* found) {
    return found ? std::optional<Found>(*found) : std::nullopt;
}

} // namespace welcomer
