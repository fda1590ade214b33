#include "text/Format.h"

#include <array>
#include <charconv>

namespace welcomer::text {

std::string Argument::fixedDecimals(double value, int decimals) {
    // The largest double has 309 digits before the point.
    std::array<char, 320> buffer{};
    const auto end = std::to_chars(buffer.data(), buffer.data() + buffer.size(), value,
                                   std::chars_format::fixed, decimals);
    return {buffer.data(), end.ptr};
}

std::string Argument::render(Placeholder placeholder) const {
    switch (placeholder) {
    case Placeholder::TwoDecimals:
        return _fixed(_value, 2);
    case Placeholder::ThreeDecimals:
        return _fixed(_value, 3);
    default:
        return _render(_value);
    }
}

std::string formatChecked(std::string_view format, std::span<const Argument> arguments) {
    std::string text;
    text.reserve(format.size() + 32 * arguments.size());
    auto next = arguments.begin();
    while (!format.empty()) {
        const std::size_t plain = std::min(format.find('%'), format.size());
        text.append(format.substr(0, plain));
        format.remove_prefix(plain);
        if (format.starts_with("%%")) {
            text += '%';
            format.remove_prefix(2);
        } else if (const std::optional<PlaceholderSpelling> spelling = placeholderAt(format)) {
            text += next->render(spelling->placeholder);
            ++next;
            format.remove_prefix(spelling->text.size());
        }
    }
    return text;
}

} // namespace welcomer::text
