#include "propertylist/TextPropertyListReader.h"

#include <gtest/gtest.h>

namespace welcomer {
namespace {

using Array = PropertyList::Array;
using Dictionary = PropertyList::Dictionary;

PropertyList read(std::string_view document) {
    PropertyListReadResult result = readTextPropertyList(document);
    EXPECT_EQ(result.error, "") << document;
    return result.value.value_or(false);
}

std::string errorOf(std::string_view document) {
    const PropertyListReadResult result = readTextPropertyList(document);
    EXPECT_FALSE(result) << document;
    EXPECT_EQ(result.error.find('\n'), std::string::npos);
    return result.error;
}

std::string repeated(std::string_view text, int times) {
    std::string result;
    for (int time = 0; time < times; ++time) {
        result += text;
    }
    return result;
}

TEST(TextPropertyListReader, ReadsDictionaries) {
    EXPECT_EQ(read("{}"), PropertyList());
    EXPECT_EQ(read("{ k = v; \"a b\" = {c = d;}; }"),
              PropertyList(Dictionary{{"k", "v"}, {"a b", Dictionary{{"c", "d"}}}}));
}

TEST(TextPropertyListReader, TheLastOfEqualKeysCounts) {
    EXPECT_EQ(read("{k = a; k = b;}"), PropertyList(Dictionary{{"k", "b"}}));
}

TEST(TextPropertyListReader, ReadsArrays) {
    EXPECT_EQ(read("()"), PropertyList(Array()));
    EXPECT_EQ(read("( a, (b), {} )"), PropertyList(Array{"a", Array{"b"}, PropertyList()}));
    EXPECT_EQ(read("(a,)"), PropertyList(Array{"a"}));
}

TEST(TextPropertyListReader, ReadsWords) {
    EXPECT_EQ(read("word"), PropertyList("word"));
    EXPECT_EQ(read("com.example_a-b:$1/2"), PropertyList("com.example_a-b:$1/2"));
    EXPECT_EQ(read("http://example.invalid/a"), PropertyList("http://example.invalid/a"));
    EXPECT_EQ(read("word/* and more */"), PropertyList("word"));
}

TEST(TextPropertyListReader, NumbersAreStrings) {
    EXPECT_EQ(read("(1, -2.5, YES)"), PropertyList(Array{"1", "-2.5", "YES"}));
}

TEST(TextPropertyListReader, ReadsQuotedStrings) {
    EXPECT_EQ(read("\"\""), PropertyList(""));
    EXPECT_EQ(read("\"it's {;}\n\xE2\x82\xAC\""), PropertyList("it's {;}\n\xE2\x82\xAC"));
    EXPECT_EQ(read("'say \"yes\"'"), PropertyList("say \"yes\""));
}

TEST(TextPropertyListReader, ReadsEscapes) {
    EXPECT_EQ(read(R"("\a\b\f\n\r\t\v\\\"\'\x")"), PropertyList("\a\b\f\n\r\t\v\\\"'x"));
    EXPECT_EQ(read("\"a\\\nb\\\xC3\xA9\""), PropertyList("a\nb\xC3\xA9"));
    EXPECT_EQ(read(R"("\101\60\0018\351")"), PropertyList("A0\x01"
                                                          "8\xC3\xA9"));
    EXPECT_EQ(read(R"("\U41\U20acx\Ud83d\Ude00")"), PropertyList("A\xE2\x82\xACx\xF0\x9F\x98\x80"));
}

TEST(TextPropertyListReader, RefusesMalformedEscapes) {
    EXPECT_EQ(errorOf(R"("ab\Ux")"), "line 1, column 4: an escape without digits");
    EXPECT_EQ(errorOf(R"("\Ud83d")"), "line 1, column 2: half a surrogate pair");
    EXPECT_EQ(errorOf(R"("\Ud83d\U41")"), "line 1, column 2: half a surrogate pair");
    EXPECT_EQ(errorOf(R"("\Ude00")"), "line 1, column 2: half a surrogate pair");
}

TEST(TextPropertyListReader, ReadsData) {
    EXPECT_EQ(read("<>"), PropertyList(PropertyList::Data()));
    EXPECT_EQ(read("< 66 6 f\n6F >"), PropertyList(PropertyList::Data{"foo"}));
}

TEST(TextPropertyListReader, RefusesMalformedData) {
    EXPECT_EQ(errorOf("<666>"), "line 1, column 5: data ends within a byte");
    EXPECT_EQ(errorOf("<66 6g>"), "line 1, column 6: expected a hexadecimal digit, found \"g\"");
    EXPECT_EQ(errorOf("(<66"), "line 1, column 2: unterminated data");
}

TEST(TextPropertyListReader, PassesOverComments) {
    EXPECT_EQ(read("// one\n/* two\n * / */ ( /**/ a // three\r, b /* { */ ) // four"),
              PropertyList(Array{"a", "b"}));
    EXPECT_EQ(errorOf("a /* b"), "line 1, column 3: unterminated comment");
    EXPECT_EQ(errorOf("/*/"), "line 1, column 1: unterminated comment");
}

TEST(TextPropertyListReader, PairsAtTheTopLevelAreADictionary) {
    EXPECT_EQ(read("/* title */\n\"key\" = \"value\";\nother = (1);\n"),
              PropertyList(Dictionary{{"key", "value"}, {"other", Array{"1"}}}));
    EXPECT_EQ(errorOf("key = value"), "line 1, column 12: expected \";\", found the end");
    EXPECT_EQ(errorOf("key = value; other"), "line 1, column 19: expected \"=\", found the end");
    EXPECT_EQ(errorOf("key = value; }"), "line 1, column 14: expected a value, found \"}\"");
}

TEST(TextPropertyListReader, SaysWhereSomethingIsMissing) {
    EXPECT_EQ(errorOf("{k = v}"), "line 1, column 7: expected \";\", found \"}\"");
    EXPECT_EQ(errorOf("{k v;}"), "line 1, column 4: expected \"=\", found \"v\"");
    EXPECT_EQ(errorOf("{= v;}"), "line 1, column 2: expected a value, found \"=\"");
    EXPECT_EQ(errorOf("{k = ;}"), "line 1, column 6: expected a value, found \";\"");
    EXPECT_EQ(errorOf("{k = v;"), "line 1, column 8: expected a value, found the end");
    EXPECT_EQ(errorOf("(a b)"), "line 1, column 4: expected \")\", found \"b\"");
    EXPECT_EQ(errorOf("(,)"), "line 1, column 2: expected a value, found \",\"");
    EXPECT_EQ(errorOf("(a"), "line 1, column 3: expected \")\", found the end");
    EXPECT_EQ(errorOf("{(a) = b;}"), "line 1, column 2: expected a value, found \"(\"");
    EXPECT_EQ(errorOf("\n \"abc"), "line 2, column 2: unterminated string");
    EXPECT_EQ(errorOf("\"abc\\"), "line 1, column 1: unterminated string");
    EXPECT_EQ(errorOf("\"abc\\\""), "line 1, column 1: unterminated string");
    EXPECT_EQ(errorOf("\n\xC3\xA9"), "line 2, column 1: expected a value, found \"?\"");
}

TEST(TextPropertyListReader, RefusesAnEmptyDocument) {
    EXPECT_EQ(errorOf(""), "line 1, column 1: there is no value");
    EXPECT_EQ(errorOf(" // nothing"), "line 1, column 12: there is no value");
}

TEST(TextPropertyListReader, NothingMayFollowTheTopLevelValue) {
    EXPECT_EQ(errorOf("{}\n x"), "line 2, column 2: unexpected content after the top-level value");
    EXPECT_EQ(errorOf("a b"), "line 1, column 3: unexpected content after the top-level value");
    EXPECT_EQ(errorOf("() = a;"), "line 1, column 4: unexpected content after the top-level value");
    EXPECT_EQ(errorOf(std::string_view("()\0", 3)),
              "line 1, column 3: unexpected content after the top-level value");
}

TEST(TextPropertyListReader, RefusesInvalidUTF8Anywhere) {
    EXPECT_EQ(errorOf("(\"\xC3\xA9\xFF\")"), "line 1, column 4: invalid UTF-8");
    EXPECT_EQ(errorOf("() // \xC3"), "line 1, column 7: invalid UTF-8");
}

TEST(TextPropertyListReader, AcceptsAByteOrderMark) {
    EXPECT_EQ(read("\xEF\xBB\xBF(a)"), PropertyList(Array{"a"}));
    EXPECT_EQ(errorOf("\xEF\xBB\xBF(a"), "line 1, column 3: expected \")\", found the end");
}

TEST(TextPropertyListReader, ReadsTheGreatestDepthAndRefusesMore) {
    constexpr int most = kPropertyListMaximumDepth;
    EXPECT_TRUE(readTextPropertyList(repeated("(", most) + repeated(")", most)));
    EXPECT_TRUE(readTextPropertyList(repeated("{a=", most) + "b" + repeated(";}", most)));
    EXPECT_EQ(errorOf(repeated("(", most + 1) + repeated(")", most + 1)),
              "line 1, column 521: nested more than 520 deep");
    EXPECT_EQ(errorOf(repeated("{a=", most + 1) + "b" + repeated(";}", most + 1)),
              "line 1, column 1561: nested more than 520 deep");
    EXPECT_EQ(errorOf("a=" + repeated("(", most) + repeated(")", most) + ";"),
              "line 1, column 522: nested more than 520 deep");
}

TEST(TextPropertyListReader, DepthIsNesting) {
    EXPECT_EQ(read("(" + repeated("(),{a=b;},", 2000) + ")").array()->size(), 4000U);
}

TEST(TextPropertyListReader, RefusesAHundredThousandLevels) {
    EXPECT_EQ(errorOf(repeated("(", 100000)), "line 1, column 521: nested more than 520 deep");
    EXPECT_EQ(errorOf(repeated("{a=", 100000)), "line 1, column 1561: nested more than 520 deep");
}

TEST(TextPropertyListReader, RefusesEveryTruncatedDocument) {
    const std::string document = "{a = (b, \"c\\101\\U20ac\", <66 6f>); /* d */ 'e' = f; }";
    ASSERT_TRUE(readTextPropertyList(document));
    for (std::size_t length = 0; length < document.size(); ++length) {
        // A copy of its own, so that the address sanitizer sees a read beyond its end.
        const std::string truncated = document.substr(0, length);
        EXPECT_NE(errorOf(truncated), "");
    }
}

} // namespace
} // namespace welcomer
