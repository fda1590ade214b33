#include "propertylist/UnwritableValue.h"

#include "propertylist/PropertyListReader.h"
#include "propertylist/PropertyListWriter.h"
#include "propertylist/UTF8.h"

#include <gtest/gtest.h>
#include <limits>
#include <string>
#include <utility>
#include <vector>

namespace welcomer {
namespace {

using Array = PropertyList::Array;
using Date = PropertyList::Date;
using Dictionary = PropertyList::Dictionary;

constexpr double kFirstSecond = -62167219200; // of the year 0000
constexpr double kPastLastSecond = 253402300800;

PropertyList nested(int depth, PropertyList value) {
    for (int level = 0; level < depth; ++level) {
        PropertyList outer = level % 2 == 0 ? PropertyList(Array(1)) : PropertyList(Dictionary{{"k", 0}});
        (level % 2 == 0 ? outer.array()->front() : outer.dictionary()->begin()->second) = std::move(value);
        value = std::move(outer);
    }
    return value;
}

// Looks through the value and writes it, which must come to the same, with the same reason; what was written
// must be read back.
//  result  whether it can be written
bool isWritable(const PropertyList& value) {
    const std::optional<std::string> found = findUnwritableValue(value);
    std::string error;
    const std::optional<std::string> written = writeXMLPropertyList(value, &error);
    EXPECT_EQ(written.has_value(), !found.has_value()) << found.value_or("") << error;
    EXPECT_EQ(error, found.value_or(""));
    if (written) {
        const PropertyListReadResult read = readPropertyList(*written);
        EXPECT_TRUE(read) << read.error;
        EXPECT_EQ(writeXMLPropertyList(read.value.value_or(PropertyList())), written);
    }
    return written.has_value();
}

// The same wherever a value can stand.
bool isWritableAnywhere(const PropertyList& value) {
    const bool alone = isWritable(value);
    EXPECT_EQ(isWritable(Array{1, value, 2}), alone);
    EXPECT_EQ(isWritable(Dictionary{{"a", 1}, {"b", Dictionary{{"c", Array{value}}}}}), alone);
    EXPECT_EQ(!findUnwritableEntry("key", value).has_value(), alone);
    return alone;
}

std::string reasonFor(const PropertyList& value) {
    return findUnwritableValue(value).value_or("none");
}

TEST(UnwritableValue, EveryCharacterIsForTheWriterWhatItIsHereInStringsAndInKeys) {
    int refused = 0;
    // Every one of the first plane, and the ends of the others.
    for (char32_t character = 0; character < 0x110000; ++character) {
        if (isHighSurrogate(character) || isLowSurrogate(character)) {
            continue;
        }
        if (character >= 0x10000 && (character & 0xFFFF) > 1 && (character & 0xFFFF) < 0xFFFE) {
            continue;
        }
        std::string text = "a";
        appendUTF8(text, character);
        const bool isText = isWritable(text);
        EXPECT_EQ(isText, isXMLCharacter(character));
        EXPECT_EQ(isWritable(Dictionary{{text, 1}}), isText);
        EXPECT_EQ(!findUnwritableEntry(text, 1).has_value(), isText);
        refused += isText ? 0 : 1;
    }
    EXPECT_EQ(refused, 31); // 29 control characters, U+FFFE and U+FFFF
}

TEST(UnwritableValue, BytesThatAreNoUTF8AreRefusedInStringsAndKeysAndNotInData) {
    for (const char* text : {"\x80", "a\xFF", "\xC3", "\xED\xA0\x80", "\xF4\x90\x80\x80"}) {
        EXPECT_FALSE(isWritableAnywhere(text));
        EXPECT_FALSE(isWritable(Dictionary{{text, 1}}));
        EXPECT_TRUE(isWritableAnywhere(PropertyList::Data{text}));
    }
}

TEST(UnwritableValue, ADateLiesInTheCalendarsYears) {
    for (const double seconds : {kFirstSecond, kFirstSecond + 0.5, 0.0, -0.5, kPastLastSecond - 0.5}) {
        EXPECT_TRUE(isWritableAnywhere(Date{seconds})) << seconds;
    }
    using Limits = std::numeric_limits<double>;
    for (const double seconds : {kFirstSecond - 0.5, kPastLastSecond, 1e15, -1e15, Limits::max(),
                                 Limits::infinity(), -Limits::infinity(), Limits::quiet_NaN()}) {
        EXPECT_FALSE(isWritableAnywhere(Date{seconds})) << seconds;
    }
}

TEST(UnwritableValue, EveryNumberCanBeWritten) {
    using Limits = std::numeric_limits<double>;
    for (const double number : {0.0, -0.0, Limits::max(), Limits::denorm_min(), Limits::infinity(),
                                -Limits::infinity(), Limits::quiet_NaN()}) {
        EXPECT_TRUE(isWritableAnywhere(number)) << number;
    }
    EXPECT_TRUE(isWritableAnywhere(std::numeric_limits<std::uint64_t>::max()));
    EXPECT_TRUE(isWritableAnywhere(true));
}

TEST(UnwritableValue, NestingIsBoundedWhetherTheInnermostIsEmptyOrNot) {
    constexpr int most = kPropertyListMaximumDepth;
    for (const PropertyList& innermost : {PropertyList(Array{}), PropertyList(Dictionary{}),
                                          PropertyList(Array{1}), PropertyList(Dictionary{{"a", "b"}})}) {
        EXPECT_TRUE(isWritable(nested(most - 1, innermost)));
        EXPECT_FALSE(isWritable(nested(most, innermost)));
        EXPECT_EQ(findUnwritableEntry("a", nested(most - 2, innermost)), std::nullopt);
        EXPECT_NE(findUnwritableEntry("a", nested(most - 1, innermost)), std::nullopt);
    }
    EXPECT_TRUE(isWritable(nested(most, "text")));
    EXPECT_FALSE(isWritable(nested(most + 1, "text")));
}

TEST(UnwritableValue, IsToldWithItsPlace) {
    const Dictionary deep{
        {"delegates", Dictionary{{"org.example.notes", Dictionary{{"names", Array{"a", "b", "c\x01"}}}}}}};
    EXPECT_EQ(reasonFor(deep),
              "delegates/org.example.notes/names/2 holds U+0001, for which XML has no place");
    EXPECT_EQ(reasonFor(Array{0, Date{1e15}}), "1 is a date outside the years 0000 to 9999");
    EXPECT_EQ(reasonFor("\xEF\xBF\xBE"), "the value holds U+FFFE, for which XML has no place");
    EXPECT_EQ(reasonFor(Dictionary{{"a", Dictionary{{"b\x1B[2J", 1}}}}),
              "a/b?[2J is a key that holds U+001B, for which XML has no place");
    EXPECT_EQ(findUnwritableEntry("Key", "\x02"), "Key holds U+0002, for which XML has no place");
    EXPECT_EQ(findUnwritableEntry("\n", Array{"\x02"}), "?/0 holds U+0002, for which XML has no place");
}

TEST(UnwritableValue, IsToldInOneLineHoweverFarInside) {
    const std::string longKey(1000, 'x');
    PropertyList value = "\x01";
    for (int level = 0; level < 500; ++level) {
        value = Dictionary{{longKey, std::move(value)}};
    }
    const std::string reason = reasonFor(value);
    EXPECT_LT(reason.size(), 512U);
    EXPECT_TRUE(reason.ends_with("/... holds U+0001, for which XML has no place")) << reason;
}

} // namespace
} // namespace welcomer
