#include "propertylist/CalendarDate.h"

#include <chrono>
#include <cmath>

namespace welcomer {

namespace {

using namespace std::chrono;

constexpr sys_days kFirstDay = year(0) / January / 1;
constexpr sys_days kLastDay = year(9999) / December / 31;

void appendNumber(std::string& text, int value, int digits) {
    const std::size_t start = text.size();
    text.resize(start + static_cast<std::size_t>(digits));
    for (auto place = text.rbegin(); digits > 0; --digits, ++place, value /= 10) {
        *place = static_cast<char>('0' + value % 10);
    }
}

} // namespace

std::optional<std::string> formatCalendarDate(PropertyList::Date date) {
    const double wholeSeconds = std::floor(date.secondsSince1970);
    constexpr auto first = static_cast<double>(sys_seconds(kFirstDay).time_since_epoch().count());
    constexpr auto end = static_cast<double>(sys_seconds(kLastDay + days(1)).time_since_epoch().count());
    if (!(wholeSeconds >= first && wholeSeconds < end)) {
        return std::nullopt;
    }
    const sys_seconds moment(seconds(static_cast<std::int64_t>(wholeSeconds)));
    const auto day = floor<days>(moment);
    const year_month_day calendar(day);
    const hh_mm_ss clock(moment - day);
    std::string text;
    appendNumber(text, static_cast<int>(calendar.year()), 4);
    text += '-';
    appendNumber(text, static_cast<int>(static_cast<unsigned>(calendar.month())), 2);
    text += '-';
    appendNumber(text, static_cast<int>(static_cast<unsigned>(calendar.day())), 2);
    text += 'T';
    appendNumber(text, static_cast<int>(clock.hours().count()), 2);
    text += ':';
    appendNumber(text, static_cast<int>(clock.minutes().count()), 2);
    text += ':';
    appendNumber(text, static_cast<int>(clock.seconds().count()), 2);
    return text += 'Z';
}

std::optional<PropertyList::Date> parseCalendarDate(std::string_view text) {
    static constexpr std::string_view form = "0000-00-00T00:00:00Z"; // a zero stands for any digit
    if (text.size() != form.size()) {
        return std::nullopt;
    }
    int fields[6] = {}; // year, month, day, hour, minute, second
    int* field = fields;
    for (std::size_t index = 0; index < form.size(); ++index) {
        if (form[index] != '0') {
            if (text[index] != form[index]) {
                return std::nullopt;
            }
            ++field;
        } else if (text[index] >= '0' && text[index] <= '9') {
            *field = *field * 10 + (text[index] - '0');
        } else {
            return std::nullopt;
        }
    }
    const year_month_day calendar{year(fields[0]), month(static_cast<unsigned>(fields[1])),
                                  day(static_cast<unsigned>(fields[2]))};
    if (!calendar.ok() || fields[3] > 23 || fields[4] > 59 || fields[5] > 59) {
        return std::nullopt;
    }
    const sys_seconds moment =
        sys_days(calendar) + hours(fields[3]) + minutes(fields[4]) + seconds(fields[5]);
    return PropertyList::Date{static_cast<double>(moment.time_since_epoch().count())};
}

} // namespace welcomer
