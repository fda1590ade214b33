#include "backends/accountserver/Members.h"

#include "backends/accountserver/JSONPropertyList.h"
#include "propertylist/PropertyListWriter.h"
#include "propertylist/XMLPropertyListReader.h"

#include <type_traits>
#include <utility>

namespace welcomer::accountserver {

namespace {

PropertyListReadResult read(std::string_view body, ContentType type) {
    if (body.size() > kMaximumBodySize) {
        return {std::nullopt, "the body is longer than " + std::to_string(kMaximumBodySize) + " bytes"};
    }
    return type == ContentType::JSON ? readJSON(body) : readXMLPropertyListWithUniqueKeys(body);
}

// What a value holds as the wanted type; moved out of it.
template <class Content>
std::optional<Content> contentOf(PropertyList& value) {
    if constexpr (std::is_same_v<Content, PropertyList>) {
        return std::move(value);
    } else if constexpr (std::is_same_v<Content, std::int64_t>) {
        return value.integer();
    } else if constexpr (std::is_same_v<Content, bool>) {
        return value.boolean();
    } else if constexpr (std::is_same_v<Content, std::string>) {
        return value.string() ? std::optional(std::move(*value.string())) : std::nullopt;
    } else {
        return value.dictionary() ? std::optional(std::move(*value.dictionary())) : std::nullopt;
    }
}

} // namespace

std::optional<std::string> encodeMembers(const PropertyList::Dictionary& members, ContentType type,
                                         std::string* error) {
    std::optional<std::string> body =
        type == ContentType::JSON ? writeJSON(members, error) : writeXMLPropertyList(members, error);
    if (body && body->size() > kMaximumBodySize) {
        if (error) {
            *error = "the body would be longer than " + std::to_string(kMaximumBodySize) + " bytes";
        }
        return std::nullopt;
    }
    return body;
}

Members::Members(std::string_view body, ContentType type) {
    PropertyListReadResult result = read(body, type);
    if (!result) {
        _error = std::move(result.error);
    } else if (PropertyList::Dictionary* const members = result.value->dictionary()) {
        _members = std::move(*members);
    } else {
        _error = "the body is no object";
    }
}

template <class Content>
std::optional<Content> Members::_take(const char* name, const char* whatItIs, bool isRequired) {
    const auto found = _members.find(name);
    if (found == _members.end()) {
        if (isRequired) {
            _refuseMember(name, "is missing");
        }
        return std::nullopt;
    }
    std::optional<Content> content = contentOf<Content>(found->second);
    if (!content) {
        _refuseMember(name, (std::string("is no ") + whatItIs).c_str());
    }
    return content;
}

std::string Members::text(const char* name) {
    return _take<std::string>(name, "text", true).value_or("");
}

std::string Members::boundedText(const char* name, std::size_t minimum, std::size_t maximum) {
    const std::string before = _error;
    std::string taken = text(name);
    if (_error == before && (taken.size() < minimum || taken.size() > maximum)) {
        _refuseMember(name, taken.empty() ? "is empty" : "is too long");
    }
    return taken;
}

std::int64_t Members::integer(const char* name) {
    return _take<std::int64_t>(name, "integer", true).value_or(0);
}

PropertyList::Dictionary Members::dictionary(const char* name) {
    return _take<PropertyList::Dictionary>(name, "object", true).value_or(PropertyList::Dictionary());
}

PropertyList Members::value(const char* name) {
    return _take<PropertyList>(name, "value", true).value_or(PropertyList());
}

Members Members::object(const char* name) {
    return {dictionary(name), _path + name + "/"};
}

std::optional<std::string> Members::optionalText(const char* name) {
    return _take<std::string>(name, "text", false);
}

std::optional<bool> Members::optionalBoolean(const char* name) {
    return _take<bool>(name, "boolean", false);
}

std::optional<PropertyList::Dictionary> Members::optionalDictionary(const char* name) {
    return _take<PropertyList::Dictionary>(name, "object", false);
}

std::optional<PropertyList> Members::optionalValue(const char* name) {
    return _take<PropertyList>(name, "value", false);
}

void Members::refuse(const std::string& what) {
    if (_error.empty()) {
        _error = what;
    }
}

void Members::_refuseMember(const char* name, const char* why) {
    refuse("the member " + _path + name + " " + why);
}

} // namespace welcomer::accountserver
