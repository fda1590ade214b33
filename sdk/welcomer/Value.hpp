// Property-list values in C++17 or later, over the functions of wl_host. DelegatePlugin.hpp includes this.

#ifndef WELCOMER_VALUE_HPP
#define WELCOMER_VALUE_HPP

#include <welcomer/delegate_plugin.h>

#include <cstddef>
#include <cstdint>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>
#include <type_traits>
#include <utility>

// Two plug-ins built against different versions of this header share no symbol of it: all of it is hidden.
// GCC then warns of a derived class in a library that is not compiled with -fvisibility=hidden, which does no
// harm here; so that authors need no option, that warning is off from here on.
#if defined(__GNUC__) && !defined(__clang__)
#pragma GCC diagnostic ignored "-Wattributes"
#endif
#pragma GCC visibility push(hidden)

#if defined(__cpp_exceptions)
#define WL_DETAIL_HAS_EXCEPTIONS 1
#else
#define WL_DETAIL_HAS_EXCEPTIONS 0
#endif

namespace welcomer::sdk {

namespace detail {

inline const wl_host* hostTable = nullptr; // set when the first instance is made, the same for all

// Throws; where the plug-in is compiled without exceptions, its caller goes on.
inline void refuse([[maybe_unused]] const char* reason) {
#if WL_DETAIL_HAS_EXCEPTIONS
    throw std::invalid_argument(reason);
#endif
}

} // namespace detail

// The host's functions, once an instance is being made.
inline const wl_host& host() {
    return *detail::hostTable;
}

class Value;

// A property-list value that belongs to somebody else: the response, or what is inside a Value. It is as
// valid as what it was taken from, a response for the length of the call; keep a copy() for longer. May be no
// value at all, which is of no type and has no elements.
class ValueView {
  public:
    ValueView() = default;
    explicit ValueView(const wl_value* handle) : _handle(handle) {}

    explicit operator bool() const { return _handle != nullptr; }
    const wl_value* handle() const { return _handle; }
    wl_value_type type() const { return host().value_type(_handle); }

    // Each gives the content when the value is of exactly that type, else none.
    std::optional<bool> boolean() const { return get<bool>(host().get_boolean); }
    std::optional<std::int64_t> integer() const { return get<std::int64_t>(host().get_integer); }
    std::optional<std::uint64_t> unsignedInteger() const { return get<std::uint64_t>(host().get_unsigned); }
    std::optional<double> real() const { return get<double>(host().get_real); }
    std::optional<double> secondsSince1970() const { return get<double>(host().get_date); } // a date

    std::optional<std::string> string() const {
        std::size_t length = 0;
        const char* text = host().get_string(_handle, &length);
        return text ? std::optional<std::string>(std::in_place, text, length) : std::nullopt;
    }

    std::optional<std::string> data() const {
        std::size_t length = 0;
        const void* bytes = host().get_data(_handle, &length);
        return bytes ? std::optional<std::string>(std::in_place, static_cast<const char*>(bytes), length)
                     : std::nullopt;
    }

    // How many elements or entries.
    std::size_t size() const { return host().count(_handle); }

    // An element, or the value of a key; no value when there is none.
    ValueView at(std::size_t index) const { return ValueView(host().array_at(_handle, index)); }
    ValueView find(std::string_view key) const {
        return ValueView(host().dictionary_get(_handle, key.data() ? key.data() : "", key.size()));
    }

    // Calls `visit(std::string_view key, ValueView value)` for each entry, in key order.
    template <class Visit>
    void forEach(Visit visit) const {
        const char* key = nullptr;
        std::size_t length = 0;
        const wl_value* value = nullptr;
        while (host().dictionary_next(_handle, &key, &length, &value)) {
            visit(std::string_view(key, length), ValueView(value));
        }
    }

    // The same value, of one's own. Throws for no value.
    inline Value copy() const;

  private:
    template <class T>
    std::optional<T> get(bool (*getter)(const wl_value*, T*)) const {
        T result{};
        return getter(_handle, &result) ? std::optional<T>(result) : std::nullopt;
    }

    const wl_value* _handle = nullptr;
};

// A property-list value of one's own. Throws std::invalid_argument when it cannot be built: text that is no
// UTF-8 or holds a character that XML cannot hold (control characters), a date outside the years 0000 to
// 9999, nesting beyond WL_VALUE_DEPTH_LIMIT, an entry for what is no dictionary. Where the plug-in is compiled without
// exceptions, such a value is no value instead, and such an entry is left out.
class Value {
  public:
    Value(std::string_view text) : _handle(host().new_string(text.data() ? text.data() : "", text.size())) {
        require();
    }
    Value(const std::string& text) : Value(std::string_view(text)) {}
    Value(const char* text) : Value(std::string_view(text)) {}
    template <class T, std::enable_if_t<std::is_arithmetic_v<T>, int> = 0>
    Value(T number) : _handle(make(number)) {
        require();
    }
    static Value dictionary() { return adopt(host().new_dictionary()); }
    static Value array() { return adopt(host().new_array()); }
    static Value data(std::string_view bytes) { return adopt(host().new_data(bytes.data(), bytes.size())); }
    static Value date(double secondsSince1970) { return adopt(host().new_date(secondsSince1970)); }

    // Takes over a handle.
    static Value adopt(wl_value* handle) { return Value(handle, 0); }

    Value(Value&& other) noexcept : _handle(std::exchange(other._handle, nullptr)) {}
    Value& operator=(Value&& other) noexcept {
        std::swap(_handle, other._handle);
        return *this;
    }
    ~Value() { host().release(_handle); }

    Value& set(std::string_view key, Value value) {
        if (!host().dictionary_set(_handle, key.data() ? key.data() : "", key.size(), value.giveUp())) {
            detail::refuse("an entry that cannot be set");
        }
        return *this;
    }

    Value& append(Value value) {
        if (!host().array_append(_handle, value.giveUp())) {
            detail::refuse("an element that cannot be appended");
        }
        return *this;
    }

    ValueView view() const { return ValueView(_handle); } // no value where this could not be built

    // Hands the handle to the caller.
    wl_value* giveUp() { return std::exchange(_handle, nullptr); }

  private:
    Value(wl_value* handle, int /*tells it from a number*/) : _handle(handle) { require(); }

    template <class T>
    static wl_value* make(T number) {
        if constexpr (std::is_same_v<T, bool>) {
            return host().new_boolean(number);
        } else if constexpr (std::is_floating_point_v<T>) {
            return host().new_real(static_cast<double>(number));
        } else if constexpr (std::is_signed_v<T>) {
            return host().new_integer(number);
        } else {
            return host().new_unsigned(number);
        }
    }

    void require() const {
        if (!_handle) {
            detail::refuse("a value that cannot be built");
        }
    }

    wl_value* _handle;
};

inline Value ValueView::copy() const {
    return Value::adopt(host().copy(_handle));
}

} // namespace welcomer::sdk

#pragma GCC visibility pop

#endif
