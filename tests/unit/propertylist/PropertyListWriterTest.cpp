#include "propertylist/PropertyListWriter.h"

#include "propertylist/PropertyListReader.h"

#include <gtest/gtest.h>
#include <limits>

namespace welcomer {
namespace {

constexpr const char* kHead = "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n";
constexpr const char* kTail = "</plist>\n";

// What stands between head and tail.
std::string written(const PropertyList& value) {
    const std::optional<std::string> text = writeXMLPropertyList(value);
    if (!text || !text->starts_with(kHead) || !text->ends_with(kTail)) {
        ADD_FAILURE() << text.value_or("nothing written");
        return {};
    }
    return text->substr(std::string_view(kHead).size(),
                        text->size() - std::string_view(kHead).size() - std::string_view(kTail).size());
}

std::string errorOf(const PropertyList& value) {
    std::string error;
    EXPECT_EQ(writeXMLPropertyList(value, &error), std::nullopt);
    EXPECT_EQ(writeXMLPropertyList(value), std::nullopt);
    return error;
}

PropertyList nested(int depth) {
    PropertyList value("deep");
    for (int level = 0; level < depth; ++level) {
        PropertyList outer = level % 2 ? PropertyList(PropertyList::Array(1))
                                       : PropertyList(PropertyList::Dictionary{{"k", 0}});
        (level % 2 ? outer.array()->front() : outer.dictionary()->begin()->second) = std::move(value);
        value = std::move(outer);
    }
    return value;
}

TEST(PropertyListWriter, WritesEveryType) {
    EXPECT_EQ(written("text"), "<string>text</string>\n");
    EXPECT_EQ(written(-7), "<integer>-7</integer>\n");
    EXPECT_EQ(written(std::numeric_limits<std::uint64_t>::max()),
              "<integer>18446744073709551615</integer>\n");
    EXPECT_EQ(written(std::numeric_limits<std::int64_t>::min()), "<integer>-9223372036854775808</integer>\n");
    EXPECT_EQ(written(0.5), "<real>0.5</real>\n");
    EXPECT_EQ(written(true), "<true/>\n");
    EXPECT_EQ(written(false), "<false/>\n");
    EXPECT_EQ(written(PropertyList::Date{981173106.5}), "<date>2001-02-03T04:05:06Z</date>\n");
    EXPECT_EQ(written(PropertyList::Data{"foo"}), "<data>\nZm9v\n</data>\n");
}

TEST(PropertyListWriter, WritesEmptyValues) {
    EXPECT_EQ(written(""), "<string></string>\n");
    EXPECT_EQ(written(PropertyList::Data()), "<data></data>\n");
    EXPECT_EQ(written(PropertyList::Dictionary()), "<dict/>\n");
    EXPECT_EQ(written(PropertyList::Array()), "<array/>\n");
}

TEST(PropertyListWriter, IndentsWhatIsNestedAndKeepsKeyOrder) {
    const PropertyList value(
        PropertyList::Dictionary{{"b", PropertyList::Array{1, PropertyList::Data{"foo"}}},
                                 {"a", PropertyList::Dictionary{{"c", true}}}});
    EXPECT_EQ(written(value), "<dict>\n"
                              "\t<key>a</key>\n"
                              "\t<dict>\n"
                              "\t\t<key>c</key>\n"
                              "\t\t<true/>\n"
                              "\t</dict>\n"
                              "\t<key>b</key>\n"
                              "\t<array>\n"
                              "\t\t<integer>1</integer>\n"
                              "\t\t<data>\n"
                              "\t\tZm9v\n"
                              "\t\t</data>\n"
                              "\t</array>\n"
                              "</dict>\n");
}

TEST(PropertyListWriter, EscapesWhatXMLWouldTakeForMarkup) {
    EXPECT_EQ(written("a<b>&\"c'\r\n\t"), "<string>a&lt;b&gt;&amp;\"c'&#13;\n\t</string>\n");
    EXPECT_EQ(written(PropertyList::Dictionary{{"<&", 1}}),
              "<dict>\n\t<key>&lt;&amp;</key>\n\t<integer>1</integer>\n</dict>\n");
}

TEST(PropertyListWriter, BreaksDataIntoLines) {
    const std::string text = written(PropertyList::Data{std::string(58, 'x')});
    const std::string line = [] {
        std::string characters;
        for (int group = 0; group < 19; ++group) {
            characters += "eHh4";
        }
        return characters;
    }();
    EXPECT_EQ(text, "<data>\n" + line + "\neA==\n</data>\n");
}

TEST(PropertyListWriter, WhatIsWrittenReadsBackEqual) {
    std::string everyByte;
    for (int byte = 0; byte < 256; ++byte) {
        everyByte += static_cast<char>(byte);
    }
    const PropertyList value(PropertyList::Dictionary{
        {"", "empty key"},
        {"array", PropertyList::Array{1, -1, 0.1, true, false, "", PropertyList::Array(), PropertyList()}},
        {"data", PropertyList::Data{everyByte}},
        {"date", PropertyList::Date{-62167219200.0}},
        {"infinite", std::numeric_limits<double>::infinity()},
        {"text", " \r\n\t\r<&>]]>\" '\xE2\x82\xAC\xF0\x9F\x98\x80 "},
        {"unsigned", std::numeric_limits<std::uint64_t>::max()},
    });
    const PropertyListReadResult result = readPropertyList(writeXMLPropertyList(value).value());
    ASSERT_TRUE(result) << result.error;
    EXPECT_EQ(*result.value, value);
}

TEST(PropertyListWriter, DataOfEveryLengthReadsBackEqual) {
    for (std::size_t length = 0; length < 200; ++length) {
        const PropertyList value(PropertyList::Data{std::string(length, '\xA5')});
        EXPECT_EQ(readPropertyList(writeXMLPropertyList(value).value()).value, value);
    }
}

TEST(PropertyListWriter, RefusesStringsThatAreNoUTF8) {
    EXPECT_EQ(errorOf("a\xFF"), "the value holds invalid UTF-8, for which XML has no place");
    EXPECT_EQ(errorOf(PropertyList::Dictionary{{"\x80", 1}}),
              "? is a key that holds invalid UTF-8, for which XML has no place");
}

TEST(PropertyListWriter, RefusesCharactersThatXMLHasNoPlaceFor) {
    EXPECT_EQ(errorOf("a\x01"), "the value holds U+0001, for which XML has no place");
    EXPECT_EQ(errorOf(std::string(1, '\0')), "the value holds U+0000, for which XML has no place");
    EXPECT_EQ(errorOf("\xEF\xBF\xBF"), "the value holds U+FFFF, for which XML has no place");
}

TEST(PropertyListWriter, RefusesDatesBeyondTheCalendar) {
    EXPECT_EQ(errorOf(PropertyList::Date{253402300800.0}),
              "the value is a date outside the years 0000 to 9999");
    EXPECT_EQ(errorOf(PropertyList::Date{std::numeric_limits<double>::quiet_NaN()}),
              "the value is a date outside the years 0000 to 9999");
}

TEST(PropertyListWriter, WritesTheGreatestDepthAndRefusesMore) {
    const PropertyList value = nested(kPropertyListMaximumDepth);
    const std::optional<std::string> text = writeXMLPropertyList(value);
    ASSERT_TRUE(text);
    EXPECT_EQ(readPropertyList(*text).value, value);
    EXPECT_EQ(errorOf(nested(kPropertyListMaximumDepth + 1)),
              "k/0/k/0/k/0/k/0/... is nested more than 520 deep");
}

} // namespace
} // namespace welcomer
