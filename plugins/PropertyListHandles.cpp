#include "plugins/PropertyListHandles.h"

#include "plugins/HostExtensions.h"
#include "plugins/PluginText.h"
#include "propertylist/UTF8.h"
#include "propertylist/UnwritableValue.h"

#include <algorithm>
#include <cstring>
#include <memory>
#include <stdexcept>
#include <string_view>
#include <utility>

namespace welcomer {

namespace {

// What a plug-in owns. It knows how deep it is nested, because a value without a bound could not even be
// destroyed. Values within it are plain PropertyLists, which plug-ins only ever borrow.
struct OwnedValue {
    PropertyList value; // first, so that an owned handle is also a borrowed one
    int depth = 0;      // containers within containers; 0 for what is no container
};

const PropertyList* borrowed(const wl_value* handle) {
    return reinterpret_cast<const PropertyList*>(handle);
}

OwnedValue* owned(wl_value* handle) {
    return reinterpret_cast<OwnedValue*>(handle);
}

int depthOf(const PropertyList& value) {
    int below = 0;
    if (const auto* array = value.array()) {
        for (const PropertyList& element : *array) {
            below = std::max(below, depthOf(element));
        }
    } else if (const auto* dictionary = value.dictionary()) {
        for (const auto& [key, entry] : *dictionary) {
            below = std::max(below, depthOf(entry));
        }
    } else {
        return 0;
    }
    return below + 1;
}

// A new owned value, or null where that cannot be made: no exception may reach a plug-in.
template <class Make>
wl_value* makeOwned(int depth, Make make) noexcept {
    try {
        return reinterpret_cast<wl_value*>(new OwnedValue{PropertyList(make()), depth});
    } catch (...) {
        return nullptr;
    }
}

// A text from a plug-in, or none when it is null or cannot be written.
std::optional<std::string_view> textOf(const char* text, std::size_t length) {
    if (!text) {
        return std::nullopt;
    }
    const std::string_view view(text, length == WL_NUL_TERMINATED ? std::strlen(text) : length);
    if (findInvalidXMLText(view) != std::string_view::npos) {
        return std::nullopt;
    }
    return view;
}

template <class T>
bool give(const std::optional<T>& content, T* result) {
    if (!content || !result) {
        return false;
    }
    *result = *content;
    return true;
}

// Puts a value into a container with `put`, unless that would be nested too deep. The value is gone in any
// case.
template <class Put>
bool putInto(wl_value* container, wl_value* part, Put put) noexcept {
    if (container == part) {
        return false;
    }
    const std::unique_ptr<OwnedValue> ownedPart(owned(part));
    if (!container || !part || ownedPart->depth >= WL_VALUE_DEPTH_LIMIT) {
        return false;
    }
    try {
        if (!put(owned(container)->value, std::move(ownedPart->value))) {
            return false;
        }
    } catch (...) {
        return false;
    }
    owned(container)->depth = std::max(owned(container)->depth, ownedPart->depth + 1);
    return true;
}

wl_value_type typeOf(const PropertyList& value) {
    switch (value.type()) {
    case PropertyList::Type::Dictionary:
        return WL_VALUE_DICTIONARY;
    case PropertyList::Type::Array:
        return WL_VALUE_ARRAY;
    case PropertyList::Type::String:
        return WL_VALUE_STRING;
    case PropertyList::Type::Integer:
        return WL_VALUE_INTEGER;
    case PropertyList::Type::Real:
        return WL_VALUE_REAL;
    case PropertyList::Type::Boolean:
        return WL_VALUE_BOOLEAN;
    case PropertyList::Type::Data:
        return WL_VALUE_DATA;
    case PropertyList::Type::Date:
        return WL_VALUE_DATE;
    }
    return WL_VALUE_NONE;
}

extern "C" {

static void hostRaise(wl_error_slot* slot, const char* message) {
    if (slot) {
        reinterpret_cast<ErrorSlot*>(slot)->raise(message);
    }
}

static wl_value_type hostValueType(const wl_value* value) {
    return value ? typeOf(*borrowed(value)) : WL_VALUE_NONE;
}

static bool hostGetBoolean(const wl_value* value, bool* result) {
    return value && give(borrowed(value)->boolean(), result);
}

static bool hostGetInteger(const wl_value* value, std::int64_t* result) {
    return value && give(borrowed(value)->integer(), result);
}

static bool hostGetUnsigned(const wl_value* value, std::uint64_t* result) {
    return value && give(borrowed(value)->unsignedInteger(), result);
}

static bool hostGetReal(const wl_value* value, double* result) {
    return value && give(borrowed(value)->real(), result);
}

static bool hostGetDate(const wl_value* value, double* result) {
    const auto* date = value ? borrowed(value)->date() : nullptr;
    if (!date || !result) {
        return false;
    }
    *result = date->secondsSince1970;
    return true;
}

static const char* hostGetString(const wl_value* value, std::size_t* length) {
    const auto* text = value ? borrowed(value)->string() : nullptr;
    if (text && length) {
        *length = text->size();
    }
    return text ? text->c_str() : nullptr;
}

static const void* hostGetData(const wl_value* value, std::size_t* length) {
    const auto* data = value ? borrowed(value)->data() : nullptr;
    if (data && length) {
        *length = data->bytes.size();
    }
    return data ? data->bytes.data() : nullptr;
}

static std::size_t hostCount(const wl_value* value) {
    if (const auto* array = value ? borrowed(value)->array() : nullptr) {
        return array->size();
    }
    const auto* dictionary = value ? borrowed(value)->dictionary() : nullptr;
    return dictionary ? dictionary->size() : 0;
}

static const wl_value* hostArrayAt(const wl_value* value, std::size_t index) {
    const auto* array = value ? borrowed(value)->array() : nullptr;
    return array && index < array->size() ? borrowedHandle((*array)[index]) : nullptr;
}

static const wl_value* hostDictionaryGet(const wl_value* value, const char* key, std::size_t keyLength) {
    if (!value || !key) {
        return nullptr;
    }
    const std::string_view name(key, keyLength == WL_NUL_TERMINATED ? std::strlen(key) : keyLength);
    const PropertyList* entry = borrowed(value)->find(name);
    return entry ? borrowedHandle(*entry) : nullptr;
}

static bool hostDictionaryNext(const wl_value* value, const char** key, std::size_t* keyLength,
                               const wl_value** entry) {
    const auto* dictionary = value ? borrowed(value)->dictionary() : nullptr;
    if (!dictionary || !key || !keyLength || !entry) {
        return false;
    }
    const auto next =
        *key ? dictionary->upper_bound(std::string_view(*key, *keyLength)) : dictionary->begin();
    if (next == dictionary->end()) {
        return false;
    }
    *key = next->first.c_str();
    *keyLength = next->first.size();
    *entry = borrowedHandle(next->second);
    return true;
}

static wl_value* hostNewDictionary() {
    return makeOwned(1, [] { return PropertyList::Dictionary(); });
}

static wl_value* hostNewArray() {
    return makeOwned(1, [] { return PropertyList::Array(); });
}

static wl_value* hostNewString(const char* text, std::size_t length) {
    const auto view = textOf(text, length);
    return view ? makeOwned(0, [&] { return *view; }) : nullptr;
}

static wl_value* hostNewInteger(std::int64_t value) {
    return makeOwned(0, [value] { return value; });
}

static wl_value* hostNewUnsigned(std::uint64_t value) {
    return makeOwned(0, [value] { return value; });
}

static wl_value* hostNewReal(double value) {
    return makeOwned(0, [value] { return value; });
}

static wl_value* hostNewBoolean(bool value) {
    return makeOwned(0, [value] { return value; });
}

static wl_value* hostNewData(const void* bytes, std::size_t length) {
    if (!bytes && length != 0) {
        return nullptr;
    }
    return makeOwned(0, [=] {
        PropertyList::Data data;
        if (length != 0) {
            data.bytes.assign(static_cast<const char*>(bytes), length);
        }
        return data;
    });
}

static wl_value* hostNewDate(double secondsSince1970) {
    const PropertyList::Date date{secondsSince1970};
    return makeOwned(0, [=] {
        if (findUnwritableValue(date)) {
            throw std::invalid_argument("a date that cannot be written");
        }
        return date;
    });
}

static wl_value* hostCopy(const wl_value* value) {
    if (!value) {
        return nullptr;
    }
    const int depth = depthOf(*borrowed(value));
    return depth <= WL_VALUE_DEPTH_LIMIT ? makeOwned(depth, [&] { return *borrowed(value); }) : nullptr;
}

static bool hostArrayAppend(wl_value* array, wl_value* element) {
    return putInto(array, element, [](PropertyList& container, PropertyList&& part) {
        auto* elements = container.array();
        if (elements) {
            elements->push_back(std::move(part));
        }
        return elements != nullptr;
    });
}

static bool hostDictionarySet(wl_value* dictionary, const char* key, std::size_t keyLength, wl_value* entry) {
    return putInto(dictionary, entry, [=](PropertyList& container, PropertyList&& part) {
        auto* entries = container.dictionary();
        const auto name = textOf(key, keyLength);
        if (entries && name) {
            entries->insert_or_assign(std::string(*name), std::move(part));
        }
        return entries && name;
    });
}

static void hostRelease(wl_value* value) {
    delete owned(value);
}

static const void* hostGetExtension(const char* identifier) {
    return hostExtension(identifier);
}
}

} // namespace

const wl_host& delegatePluginHost() {
    static constexpr wl_host host = {
        .abi_version = WL_DELEGATE_PLUGIN_ABI_VERSION,
        .size = sizeof(wl_host),
        .raise = hostRaise,
        .value_type = hostValueType,
        .get_boolean = hostGetBoolean,
        .get_integer = hostGetInteger,
        .get_unsigned = hostGetUnsigned,
        .get_real = hostGetReal,
        .get_date = hostGetDate,
        .get_string = hostGetString,
        .get_data = hostGetData,
        .count = hostCount,
        .array_at = hostArrayAt,
        .dictionary_get = hostDictionaryGet,
        .dictionary_next = hostDictionaryNext,
        .new_dictionary = hostNewDictionary,
        .new_array = hostNewArray,
        .new_string = hostNewString,
        .new_integer = hostNewInteger,
        .new_unsigned = hostNewUnsigned,
        .new_real = hostNewReal,
        .new_boolean = hostNewBoolean,
        .new_data = hostNewData,
        .new_date = hostNewDate,
        .copy = hostCopy,
        .array_append = hostArrayAppend,
        .dictionary_set = hostDictionarySet,
        .release = hostRelease,
        .get_extension = hostGetExtension,
    };
    return host;
}

const wl_value* borrowedHandle(const PropertyList& value) {
    return reinterpret_cast<const wl_value*>(&value);
}

std::optional<PropertyList> takeHandle(wl_value* handle) {
    const std::unique_ptr<OwnedValue> value(owned(handle));
    return value ? std::optional(std::move(value->value)) : std::nullopt;
}

void ErrorSlot::raise(const char* message) noexcept {
    if (_raised) {
        return;
    }
    _raised = true;
    try {
        _message = message ? pluginText(message) : "no reason given";
    } catch (...) {
        _message = "out of memory"; // short enough to need none
    }
}

} // namespace welcomer
