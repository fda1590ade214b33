#include "text/Describe.h"

#include <gtest/gtest.h>
#include <limits>
#include <stdexcept>

namespace welcomer::text {
namespace {

TEST(Describe, StringsStandAsTheyAre) {
    EXPECT_EQ(describe(std::string("50% of %@")), "50% of %@");
    EXPECT_EQ(describe("text"), "text");
    EXPECT_EQ(describe(PropertyList("text")), "text");
}

TEST(Describe, NoneIsNull) {
    EXPECT_EQ(describe(std::optional<std::string>()), "(null)");
    EXPECT_EQ(describe(static_cast<const char*>(nullptr)), "(null)");
    EXPECT_EQ(describe(std::exception_ptr()), "(null)");
    EXPECT_EQ(describe(std::optional<std::string>("some")), "some");
}

TEST(Describe, NumbersAreDecimal) {
    EXPECT_EQ(describe(-7), "-7");
    EXPECT_EQ(describe(std::numeric_limits<std::uint64_t>::max()), "18446744073709551615");
    EXPECT_EQ(describe(PropertyList(std::numeric_limits<std::int64_t>::min())), "-9223372036854775808");
    EXPECT_EQ(describe(PropertyList(std::numeric_limits<std::uint64_t>::max())), "18446744073709551615");
}

TEST(Describe, RealsAreShortest) {
    EXPECT_EQ(describe(0.1), "0.1");
    EXPECT_EQ(describe(2.0), "2");
    EXPECT_EQ(describe(PropertyList(1e300)), "1e+300");
}

TEST(Describe, BooleansAreOneAndZero) {
    EXPECT_EQ(describe(true), "1");
    EXPECT_EQ(describe(PropertyList(false)), "0");
}

TEST(Describe, DataIsHexadecimal) {
    EXPECT_EQ(describe(PropertyList(PropertyList::Data{std::string("\x00\xfe\x10", 3)})), "<00fe10>");
}

TEST(Describe, DatesAreISO8601InUTC) {
    EXPECT_EQ(describe(PropertyList(PropertyList::Date{0})), "1970-01-01T00:00:00Z");
    EXPECT_EQ(describe(PropertyList(PropertyList::Date{-0.5})), "1969-12-31T23:59:59Z");
    EXPECT_EQ(describe(PropertyList(PropertyList::Date{1582979696})), "2020-02-29T12:34:56Z");
}

TEST(Describe, ADateOutOfTheCalendarIsItsNumber) {
    EXPECT_EQ(describe(PropertyList(PropertyList::Date{253402300800.0})), "253402300800");
    EXPECT_EQ(describe(PropertyList(PropertyList::Date{std::numeric_limits<double>::infinity()})), "inf");
}

TEST(Describe, CollectionsAreOnOneLineInKeyOrder) {
    const PropertyList value(PropertyList::Dictionary{
        {"other", PropertyList::Array{1, 2}},
        {"key", "value"},
        {"empty", PropertyList::Dictionary{}},
    });
    EXPECT_EQ(describe(value), "{empty = {}; key = value; other = (1, 2)}");
    EXPECT_EQ(describe(std::vector<std::string>{"a", "b"}), "(a, b)");
}

TEST(Describe, TextsInACollectionEndNoLine) {
    EXPECT_EQ(describe(PropertyList(
                  PropertyList::Dictionary{{"a\nb", PropertyList::Array{"c\nd", "\x1b"}}, {"e", "f\ng"}})),
              "{a\\nb = (c\\nd, \\x1b); e = f\\ng}");
    EXPECT_EQ(describe(PropertyList("as\nit stands")), "as\nit stands");
}

TEST(Describe, ExceptionsAreTheirText) {
    EXPECT_EQ(describe(std::runtime_error("no room")), "no room");
    EXPECT_EQ(describe(std::make_exception_ptr(std::runtime_error("no room"))), "no room");
    EXPECT_EQ(describe(std::make_exception_ptr(42)), "unknown exception");
}

} // namespace
} // namespace welcomer::text
