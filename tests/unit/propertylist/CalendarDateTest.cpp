#include "propertylist/CalendarDate.h"

#include <gtest/gtest.h>
#include <limits>

namespace welcomer {
namespace {

std::optional<std::string> formatted(double secondsSince1970) {
    return formatCalendarDate({secondsSince1970});
}

std::optional<double> parsed(std::string_view text) {
    const auto date = parseCalendarDate(text);
    return date ? std::optional(date->secondsSince1970) : std::nullopt;
}

TEST(CalendarDate, FormatsInISO8601) {
    EXPECT_EQ(formatted(0), "1970-01-01T00:00:00Z");
    EXPECT_EQ(formatted(981173106), "2001-02-03T04:05:06Z");
    EXPECT_EQ(formatted(-1), "1969-12-31T23:59:59Z");
}

TEST(CalendarDate, CutsToWholeSeconds) {
    EXPECT_EQ(formatted(0.999), "1970-01-01T00:00:00Z");
    EXPECT_EQ(formatted(-0.001), "1969-12-31T23:59:59Z");
}

TEST(CalendarDate, CoversTheYears0To9999AndNoMore) {
    EXPECT_EQ(formatted(-62167219200.0), "0000-01-01T00:00:00Z");
    EXPECT_EQ(formatted(-62167219200.5), std::nullopt);
    EXPECT_EQ(formatted(253402300799.5), "9999-12-31T23:59:59Z");
    EXPECT_EQ(formatted(253402300800.0), std::nullopt);
    EXPECT_EQ(formatted(std::numeric_limits<double>::infinity()), std::nullopt);
    EXPECT_EQ(formatted(std::numeric_limits<double>::quiet_NaN()), std::nullopt);
}

TEST(CalendarDate, ReadsWhatItFormats) {
    for (const double seconds : {0.0, -1.0, 981173106.0, -62167219200.0, 253402300799.0, 951782400.0}) {
        EXPECT_EQ(parsed(*formatted(seconds)), seconds);
    }
}

TEST(CalendarDate, RefusesOtherForms) {
    for (const char* text :
         {"", "2001", "2001-02-03", "2001-02-03T04:05:06", "2001-02-03 04:05:06Z", "2001-02-03T04:05:06+",
          "2001-02-03T04:05:06Z ", "+001-02-03T04:05:06Z", "2001-2a-03T04:05:06Z", "2001/02/03T04:05:06Z"}) {
        EXPECT_EQ(parsed(text), std::nullopt) << text;
    }
}

TEST(CalendarDate, RefusesWhatDoesNotExist) {
    for (const char* text :
         {"2001-00-03T04:05:06Z", "2001-13-03T04:05:06Z", "2001-02-00T04:05:06Z", "2001-02-29T04:05:06Z",
          "2001-04-31T04:05:06Z", "2001-02-03T24:05:06Z", "2001-02-03T04:60:06Z", "2001-02-03T04:05:60Z"}) {
        EXPECT_EQ(parsed(text), std::nullopt) << text;
    }
    EXPECT_TRUE(parsed("2000-02-29T00:00:00Z"));
}

} // namespace
} // namespace welcomer
