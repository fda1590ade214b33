// The formatter of the system's message texts: it understands %@ %d %ld %lu %s %0.2f %0.3f and %%, and adds
// nothing.

#pragma once

#include "text/Describe.h"

#include <array>
#include <concepts>
#include <cstddef>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <type_traits>

namespace welcomer::text {

// What a placeholder takes.
enum class Placeholder { Object, Int, Long, UnsignedLong, CString, TwoDecimals, ThreeDecimals };

// A placeholder as it stands in a format, and what it takes; the longest spelling of a common beginning
// first.
struct PlaceholderSpelling {
    std::string_view text;
    Placeholder placeholder;
};

inline constexpr std::array kPlaceholderSpellings{
    PlaceholderSpelling{"%@", Placeholder::Object},
    PlaceholderSpelling{"%d", Placeholder::Int},
    PlaceholderSpelling{"%ld", Placeholder::Long},
    PlaceholderSpelling{"%lu", Placeholder::UnsignedLong},
    PlaceholderSpelling{"%s", Placeholder::CString},
    PlaceholderSpelling{"%0.2f", Placeholder::TwoDecimals},
    PlaceholderSpelling{"%0.3f", Placeholder::ThreeDecimals},
};

// The placeholder at the start of `rest`, or none.
constexpr std::optional<PlaceholderSpelling> placeholderAt(std::string_view rest) {
    for (const PlaceholderSpelling& spelling : kPlaceholderSpellings) {
        if (rest.starts_with(spelling.text)) {
            return spelling;
        }
    }
    return std::nullopt;
}

// Whether an argument of type T may stand for a placeholder.
template <class T>
constexpr bool accepts(Placeholder placeholder) {
    using Plain = std::remove_cvref_t<T>;
    switch (placeholder) {
    case Placeholder::Object:
        return requires(const Plain& value) {
            { describe(value) } -> std::convertible_to<std::string>;
        };
    case Placeholder::Int:
        return std::signed_integral<Plain> && sizeof(Plain) <= sizeof(int);
    case Placeholder::Long:
        return std::signed_integral<Plain> && sizeof(Plain) == sizeof(long);
    case Placeholder::UnsignedLong:
        return std::unsigned_integral<Plain> && sizeof(Plain) == sizeof(unsigned long);
    case Placeholder::CString:
        return std::convertible_to<T, const char*>;
    case Placeholder::TwoDecimals:
    case Placeholder::ThreeDecimals:
        return std::floating_point<Plain>;
    }
    return false;
}

// A format that is checked against its arguments' number and kinds when it is compiled.
template <class... Arguments>
class FormatString {
  public:
    template <std::size_t N>
    consteval FormatString(const char (&format)[N]) : _text(format, N - 1) {
        constexpr std::size_t count = sizeof...(Arguments);
        std::size_t used = 0;
        for (std::size_t i = 0; i < _text.size(); ++i) {
            if (_text[i] != '%') {
                continue;
            }
            if (_text.substr(i).starts_with("%%")) {
                ++i;
                continue;
            }
            const std::optional<PlaceholderSpelling> spelling = placeholderAt(_text.substr(i));
            if (!spelling) {
                throw "a placeholder that the formatter does not know";
            }
            if (used == count) {
                throw "fewer arguments than placeholders";
            }
            if (!_accepted(used, spelling->placeholder)) {
                throw "an argument of the wrong kind for its placeholder";
            }
            ++used;
            i += spelling->text.size() - 1;
        }
        if (used != count) {
            throw "more arguments than placeholders";
        }
    }

    constexpr std::string_view text() const { return _text; }

  private:
    static consteval bool _accepted([[maybe_unused]] std::size_t index,
                                    [[maybe_unused]] Placeholder placeholder) {
        std::size_t i = 0;
        bool accepted = false;
        ((accepted = accepted || (i == index && accepts<Arguments>(placeholder)), ++i), ...);
        return accepted;
    }

    std::string_view _text;
};

// One argument, ready to be put into a text. Borrows what it was made from.
class Argument {
  public:
    template <class T>
    explicit Argument(const T& value) : _value(&value) {
        if constexpr (std::floating_point<T>) {
            _fixed = [](const void* v, int decimals) {
                return fixedDecimals(static_cast<double>(*static_cast<const T*>(v)), decimals);
            };
        }
        _render = [](const void* v) -> std::string {
            return describe(*static_cast<const T*>(v));
        };
    }

    std::string render(Placeholder placeholder) const;

  private:
    static std::string fixedDecimals(double value, int decimals);

    const void* _value;
    std::string (*_render)(const void*) = nullptr;
    std::string (*_fixed)(const void*, int) = nullptr;
};

// Puts the arguments into a format that has been checked.
std::string formatChecked(std::string_view format, std::span<const Argument> arguments);

// The format with its placeholders replaced.
//  format     a literal; its placeholders are checked against the arguments at compile time
//  arguments  only read during the call
// Any thread.
template <class... Arguments>
std::string format(FormatString<std::type_identity_t<Arguments>...> format, const Arguments&... arguments) {
    if constexpr (sizeof...(Arguments) == 0) {
        return formatChecked(format.text(), {});
    } else {
        const std::array<Argument, sizeof...(Arguments)> list{Argument(arguments)...};
        return formatChecked(format.text(), list);
    }
}

} // namespace welcomer::text
