#include "backends/accountserver/JSONPropertyList.h"

#include "backends/accountserver/Protocol.h"

#include <gtest/gtest.h>

#include <limits>
#include <string>

namespace welcomer::accountserver {
namespace {

std::string errorOf(const std::string& text) {
    const PropertyListReadResult result = readJSON(text);
    EXPECT_FALSE(result.value) << text;
    return result.error;
}

std::string whyUnwritable(const PropertyList& value) {
    std::string error;
    EXPECT_EQ(writeJSON(value, &error), std::nullopt);
    return error;
}

std::string nested(int depth) {
    return std::string(static_cast<std::size_t>(depth), '[') +
           std::string(static_cast<std::size_t>(depth), ']');
}

TEST(JSONPropertyListTest, IntegersRealsAndBooleansAreKeptApart) {
    EXPECT_EQ(readJSON("1").value, PropertyList(1));
    EXPECT_EQ(readJSON("-9223372036854775808").value, PropertyList(std::numeric_limits<std::int64_t>::min()));
    EXPECT_EQ(readJSON("18446744073709551615").value,
              PropertyList(std::numeric_limits<std::uint64_t>::max()));
    EXPECT_EQ(readJSON("1.0").value, PropertyList(1.0));
    EXPECT_EQ(readJSON("1e0").value, PropertyList(1.0));
    EXPECT_EQ(readJSON("true").value, PropertyList(true));
}

TEST(JSONPropertyListTest, WhatIsWrittenReadsBackAsTheSame) {
    const PropertyList value = PropertyList::Dictionary{
        {"", ""},
        {"a\"\\\n\x7F", "\xC3\xA9\r\t"},
        {"nul", std::string(1, '\0')},
        {"numbers", PropertyList::Array{0, -1, 1.0, 0.1, -0.0, 1e300, 5e-324,
                                        std::numeric_limits<std::uint64_t>::max()}},
        {"empty", PropertyList::Array{PropertyList::Array{}, PropertyList::Dictionary{}}},
        {"flags", PropertyList::Array{true, false}}};
    const auto text = writeJSON(value);
    ASSERT_TRUE(text);
    EXPECT_EQ(text->find('\n'), std::string::npos);
    EXPECT_EQ(readJSON(*text).value, value) << *text;
}

TEST(JSONPropertyListTest, WhatJSONHasNoPlaceForIsNamedWithItsPlace) {
    EXPECT_EQ(whyUnwritable(PropertyList::Dictionary{
                  {"a", PropertyList::Array{1, PropertyList::Dictionary{{"b", PropertyList::Data{"x"}}}}}}),
              "a/1/b is data, for which JSON has no place");
    EXPECT_EQ(whyUnwritable(PropertyList::Date{0}), "the value is a date, for which JSON has no place");
    EXPECT_EQ(whyUnwritable(std::numeric_limits<double>::infinity()),
              "the value is no finite number, for which JSON has no place");
    EXPECT_EQ(whyUnwritable(PropertyList::Dictionary{{"a", "\xFF"}}), "a holds invalid UTF-8");
}

TEST(JSONPropertyListTest, NestingIsBoundedInBothDirections) {
    const auto deepest = readJSON(nested(kMaximumJSONDepth));
    ASSERT_TRUE(deepest);
    EXPECT_EQ(writeJSON(*deepest.value), nested(kMaximumJSONDepth));
    EXPECT_NE(errorOf(nested(kMaximumJSONDepth + 1)).find("is nested more than 64 deep"), std::string::npos);
    EXPECT_NE(errorOf(std::string(1'000'000, '[')).find("is nested more than 64 deep"), std::string::npos);
    EXPECT_NE(whyUnwritable(PropertyList::Array{*deepest.value}).find("is nested too deep for JSON"),
              std::string::npos);
}

TEST(JSONPropertyListTest, TheNumberOfValuesIsBounded) {
    std::string text = "[0";
    for (std::size_t i = 2; i < kMaximumJSONValues; ++i) {
        text += ",0";
    }
    EXPECT_TRUE(readJSON(text + "]").value);
    EXPECT_EQ(errorOf(text + ",0]"), "there are more than 262144 values");
}

TEST(JSONPropertyListTest, KeysThatAppearTwiceAreRefused) {
    EXPECT_EQ(errorOf(R"({"a": {"b": 1, "b": 1}})"), "a/b appears twice");
    EXPECT_EQ(errorOf(R"([0, {"b": null, "b": 1}])"), "1/b appears twice");
    EXPECT_EQ(errorOf(R"({"b": 1, "\u0062": null})"), "b appears twice");
}

TEST(JSONPropertyListTest, AMemberThatIsNullIsLeftOutAndNullElsewhereIsRefused) {
    EXPECT_EQ(readJSON(R"({"a": null, "b": 1})").value, PropertyList(PropertyList::Dictionary{{"b", 1}}));
    EXPECT_EQ(errorOf(R"({"a": [1, null]})"), "a/1 is null");
    EXPECT_EQ(errorOf("null"), "the top value is null");
}

TEST(JSONPropertyListTest, NumbersOutOfRangeAreRefused) {
    EXPECT_EQ(errorOf(R"({"a": 18446744073709551616})"), "a is an integer that does not fit 64 bits");
    EXPECT_EQ(errorOf(R"([-9223372036854775809])"), "0 is an integer that does not fit 64 bits");
    EXPECT_NE(errorOf(R"({"a": 1e400})").find("a number is out of range"), std::string::npos);
}

TEST(JSONPropertyListTest, WhatIsNoJSONIsRefusedWithItsPlace) {
    EXPECT_EQ(errorOf("{\"a\": 1,\n  b}"), "line 2, column 3: this is not JSON");
    EXPECT_EQ(errorOf("{\"a\""), "line 1, column 5: the text ends too early");
    for (const char* text : {"", "  ", "{} {}", "{}x", "[1,]", "{'a': 1}", "[NaN]", "[Infinity]", "[01]",
                             "[\"\xFF\"]", "[\"\n\"]", "[\"\\ud800\"]", "// a\n[]", "<html>", "[\"\\x\"]"}) {
        EXPECT_NE(errorOf(text), "") << text;
    }
}

} // namespace
} // namespace welcomer::accountserver
