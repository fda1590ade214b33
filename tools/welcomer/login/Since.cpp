#include "tools/welcomer/login/Since.h"

#include <array>
#include <charconv>
#include <ctime>
#include <string>

namespace welcomer::tool {

namespace {

using namespace std::chrono;

// How long ago; none for what does not say so.
std::optional<seconds> ago(std::string_view text) {
    constexpr std::array<std::pair<char, seconds>, 4> kUnits{
        {{'s', seconds(1)}, {'m', minutes(1)}, {'h', hours(1)}, {'d', hours(24)}}};
    std::int32_t count = 0;
    const char* const end = text.data() + text.size();
    const auto [position, error] = std::from_chars(text.data(), end, count);
    if (error != std::errc() || count < 0 || position + 1 != end) {
        return std::nullopt;
    }
    for (const auto& [name, unit] : kUnits) {
        if (*position == name) {
            return count * unit;
        }
    }
    return std::nullopt;
}

// A local time in a format of strptime(3), which has to take all of the text.
std::optional<std::tm> parsed(const std::string& text, const char* format, std::tm fields) {
    const char* const end = ::strptime(text.c_str(), format, &fields);
    return end && *end == '\0' ? std::optional(fields) : std::nullopt;
}

microseconds sinceEpoch(std::tm fields) {
    fields.tm_isdst = -1;
    return seconds(std::mktime(&fields));
}

} // namespace

std::optional<microseconds> readSince(std::string_view text, microseconds now) {
    if (const auto before = ago(text)) {
        return now - *before;
    }
    const std::time_t moment = duration_cast<seconds>(now).count();
    std::tm today{};
    ::localtime_r(&moment, &today);
    today.tm_hour = today.tm_min = today.tm_sec = 0;
    if (text == "today") {
        return sinceEpoch(today);
    }
    if (text == "yesterday") {
        --today.tm_mday;
        return sinceEpoch(today);
    }
    for (const char* format : {"%Y-%m-%d %H:%M:%S", "%Y-%m-%d %H:%M", "%Y-%m-%d", "%H:%M:%S", "%H:%M"}) {
        if (const auto fields = parsed(std::string(text), format, today)) {
            return sinceEpoch(*fields);
        }
    }
    return std::nullopt;
}

} // namespace welcomer::tool
