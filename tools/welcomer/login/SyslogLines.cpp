#include "backends/posix/RootFolder.h"
#include "handoff/LaunchAgentFile.h"
#include "tools/welcomer/login/AgentTexts.h"
#include "tools/welcomer/login/LoginLog.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <charconv>
#include <ctime>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>
#include <utility>

namespace welcomer::tool {

namespace {

using namespace std::chrono;

// What is read of one file, from its end.
constexpr off_t kMostOfAFile = off_t{8} * 1024 * 1024;

constexpr std::array<std::string_view, 12> kMonths{"Jan", "Feb", "Mar", "Apr", "May", "Jun",
                                                   "Jul", "Aug", "Sep", "Oct", "Nov", "Dec"};

// Takes the text up to a separator, which goes too.
std::string_view take(std::string_view& text, std::string_view separator) {
    const std::size_t end = text.find(separator);
    const std::string_view taken = text.substr(0, end);
    text.remove_prefix(end == std::string_view::npos ? text.size() : end + separator.size());
    return taken;
}

// A number of so many digits, or none.
std::optional<int> takeNumber(std::string_view& text, std::size_t digits) {
    int number = 0;
    const char* const end = text.data() + std::min(digits, text.size());
    const auto [position, error] = std::from_chars(text.data(), end, number);
    if (error != std::errc() || position != end || text.size() < digits) {
        return std::nullopt;
    }
    text.remove_prefix(digits);
    return number;
}

bool skip(std::string_view& text, char character) {
    const bool is = text.starts_with(character);
    text.remove_prefix(is ? 1 : 0);
    return is;
}

// Hours, minutes and seconds with colons between them.
std::optional<seconds> takeTimeOfDay(std::string_view& text) {
    const auto hour = takeNumber(text, 2);
    const bool first = skip(text, ':');
    const auto minute = takeNumber(text, 2);
    const bool second = skip(text, ':');
    const auto rest = takeNumber(text, 2);
    if (!hour || !minute || !rest || !first || !second) {
        return std::nullopt;
    }
    return hours(*hour) + minutes(*minute) + seconds(*rest);
}

// A local time; the year is the one in which it is not in the future.
microseconds localTime(int month, int day, seconds ofDay, microseconds now) {
    const std::time_t today = duration_cast<seconds>(now).count();
    std::tm local{};
    ::localtime_r(&today, &local);
    const int thisYear = local.tm_year;
    std::time_t time = 0;
    for (const int year : {thisYear, thisYear - 1}) {
        std::tm fields{};
        fields.tm_year = year;
        fields.tm_mon = month;
        fields.tm_mday = day;
        fields.tm_sec = static_cast<int>(ofDay.count());
        fields.tm_isdst = -1;
        time = std::mktime(&fields);
        if (time <= today + duration_cast<seconds>(hours(24)).count()) {
            break;
        }
    }
    return seconds(time);
}

// "Nov 22 11:06:33", to the second.
std::optional<microseconds> takeTraditionalTime(std::string_view& text, microseconds now) {
    const auto* const month = std::ranges::find(kMonths, text.substr(0, 3));
    if (month == kMonths.end()) {
        return std::nullopt;
    }
    text.remove_prefix(3);
    skip(text, ' ');
    const auto day = takeNumber(text, skip(text, ' ') ? 1 : 2);
    const bool isSeparate = skip(text, ' ');
    const auto ofDay = takeTimeOfDay(text);
    if (!day || !isSeparate || !ofDay || !skip(text, ' ')) {
        return std::nullopt;
    }
    return localTime(static_cast<int>(month - kMonths.begin()), *day, *ofDay, now);
}

// What of a second follows its dot.
microseconds takeFraction(std::string_view& text) {
    microseconds fraction{0};
    microseconds unit{100'000};
    if (skip(text, '.')) {
        while (const auto digit = takeNumber(text, 1)) {
            fraction += *digit * unit;
            unit /= 10;
        }
    }
    return fraction;
}

// "Z", or the offset of a time zone.
std::optional<microseconds> takeZone(std::string_view& text) {
    if (skip(text, 'Z')) {
        return microseconds(0);
    }
    const bool isWest = text.starts_with('-');
    if (!skip(text, '+') && !skip(text, '-')) {
        return std::nullopt;
    }
    const auto hour = takeNumber(text, 2);
    const bool isSeparate = skip(text, ':');
    const auto minute = takeNumber(text, 2);
    if (!hour || !isSeparate || !minute) {
        return std::nullopt;
    }
    return (hours(*hour) + minutes(*minute)) * (isWest ? -1 : 1);
}

// "2026-11-22T11:06:33.123456+01:00"
std::optional<microseconds> takeISOTime(std::string_view& text) {
    const auto year = takeNumber(text, 4);
    const bool first = skip(text, '-');
    const auto month = takeNumber(text, 2);
    const bool second = skip(text, '-');
    const auto day = takeNumber(text, 2);
    const bool third = skip(text, 'T');
    const auto ofDay = takeTimeOfDay(text);
    if (!year || !first || !month || !second || !day || !third || !ofDay) {
        return std::nullopt;
    }
    const microseconds fraction = takeFraction(text);
    const auto zone = takeZone(text);
    const year_month_day date{std::chrono::year(*year), std::chrono::month(static_cast<unsigned>(*month)),
                              std::chrono::day(static_cast<unsigned>(*day))};
    if (!zone || !date.ok() || !skip(text, ' ')) {
        return std::nullopt;
    }
    return sys_days(date).time_since_epoch() + *ofDay + fraction - *zone;
}

// The end of a file, from a line's beginning on.
std::string endOf(int file) {
    struct stat status {};
    if (::fstat(file, &status) != 0 || !S_ISREG(status.st_mode)) {
        return "";
    }
    const off_t begin = std::max<off_t>(status.st_size - kMostOfAFile, 0);
    std::string content(static_cast<std::size_t>(status.st_size - begin), '\0');
    std::size_t length = 0;
    while (length < content.size()) {
        const ssize_t count = ::pread(file, content.data() + length, content.size() - length,
                                      begin + static_cast<off_t>(length));
        if (count == 0 || (count < 0 && errno != EINTR)) {
            break;
        }
        length += static_cast<std::size_t>(std::max<ssize_t>(count, 0));
    }
    content.resize(length);
    if (begin > 0) {
        content.erase(0, content.find('\n') + 1);
    }
    return content;
}

bool isOfLogins(const LogLine& line) {
    return line.program == kAgentProgramName || line.program == kLauncherProgram;
}

// The lines of logins in a file, and in the one that it was before it was begun anew.
std::vector<LogLine> linesOf(const posix::RootFolder& root, const std::string& path, microseconds now) {
    std::vector<LogLine> lines;
    for (const char* suffix : {".1", ""}) {
        const posix::FileDescriptor file = root.open(path + suffix, O_RDONLY | O_NONBLOCK);
        const std::string content = file ? endOf(file.get()) : "";
        for (std::string_view rest = content; !rest.empty();) {
            std::optional<LogLine> line = readSyslogLine(take(rest, "\n"), now);
            if (line && isOfLogins(*line)) {
                lines.push_back(std::move(*line));
            }
        }
    }
    return lines;
}

} // namespace

std::optional<LogLine> readSyslogLine(std::string_view line, microseconds now) {
    std::string_view rest = line;
    std::optional<microseconds> time = takeTraditionalTime(rest, now);
    if (!time) {
        rest = line;
        time = takeISOTime(rest);
    }
    if (!time) {
        return std::nullopt;
    }
    take(rest, " "); // the host
    std::string_view tag = take(rest, ":");
    if (tag.find(' ') != std::string_view::npos) {
        return std::nullopt;
    }
    skip(rest, ' ');
    const std::string_view program = take(tag, "[");
    return LogLine{.wallClock = *time,
                   .steady = *time,
                   .program = std::string(program),
                   .message = std::string(rest),
                   .process = std::string(take(tag, "]"))};
}

SourceLines readSyslogFile(const LoginQuery& query, microseconds now) {
    const posix::RootFolder root(query.root);
    SourceLines source;
    for (const char* path : kSyslogFiles) {
        const posix::FileDescriptor file = root.open(path, O_RDONLY | O_NONBLOCK);
        if (!file && errno == ENOENT) {
            continue;
        }
        SourceLines here{.isThere = true,
                         .isReadable = static_cast<bool>(file),
                         .name = path,
                         .lines = linesOf(root, path, now)};
        // The file that has logins serves, else the first one that is there.
        if (!source.isThere || !here.lines.empty()) {
            source = std::move(here);
        }
        if (!source.lines.empty()) {
            break;
        }
    }
    EnoughLines enough(query);
    const auto unwanted = std::find_if_not(source.lines.rbegin(), source.lines.rend(),
                                           [&](const LogLine& line) { return enough.wants(line); });
    source.lines.erase(source.lines.begin(), unwanted.base());
    return source;
}

} // namespace welcomer::tool
