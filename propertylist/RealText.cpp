#include "propertylist/RealText.h"

#include "propertylist/Characters.h"

#include <array>
#include <bit>
#include <charconv>
#include <cmath>
#include <cstdint>
#include <limits>

namespace welcomer {

namespace {

constexpr std::string_view kNotANumberWithBits = "nan(0x";

std::optional<double> parseNotANumberWithBits(std::string_view text) {
    text.remove_prefix(kNotANumberWithBits.size());
    std::uint64_t bits = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), bits, 16);
    const double value = std::bit_cast<double>(bits);
    if (error != std::errc() || std::string_view(end, text.data() + text.size()) != ")" ||
        !std::isnan(value)) {
        return std::nullopt;
    }
    return value;
}

} // namespace

std::string formatReal(double value) {
    std::array<char, 40> buffer{};
    if (std::isinf(value)) {
        return value < 0 ? "-inf" : "inf";
    }
    if (std::isnan(value)) {
        const auto bits = std::bit_cast<std::uint64_t>(value);
        if (bits == std::bit_cast<std::uint64_t>(std::numeric_limits<double>::quiet_NaN())) {
            return "nan";
        }
        const auto result = std::to_chars(buffer.begin(), buffer.end(), bits, 16);
        return std::string(kNotANumberWithBits).append(buffer.data(), result.ptr).append(")");
    }
    const auto result = std::to_chars(buffer.begin(), buffer.end(), value);
    return {buffer.data(), result.ptr};
}

std::optional<double> parseReal(std::string_view text) {
    if (text.starts_with(kNotANumberWithBits)) {
        return parseNotANumberWithBits(text);
    }
    std::string_view magnitude = text;
    const bool isNegative = text.starts_with('-');
    if (isNegative || text.starts_with('+')) {
        magnitude.remove_prefix(1);
    }
    if (equalsIgnoringCase(magnitude, "inf") || equalsIgnoringCase(magnitude, "infinity")) {
        const double infinity = std::numeric_limits<double>::infinity();
        return isNegative ? -infinity : infinity;
    }
    if (equalsIgnoringCase(magnitude, "nan")) {
        return std::numeric_limits<double>::quiet_NaN();
    }
    // What is left begins with a digit or a point: the library function knows words and forms that we do not.
    if (magnitude.empty() || !((magnitude[0] >= '0' && magnitude[0] <= '9') || magnitude[0] == '.')) {
        return std::nullopt;
    }
    double value = 0;
    const auto [end, error] = std::from_chars(magnitude.data(), magnitude.data() + magnitude.size(), value);
    if (error != std::errc() || end != magnitude.data() + magnitude.size() || std::isinf(value)) {
        return std::nullopt;
    }
    return isNegative ? -value : value;
}

} // namespace welcomer
