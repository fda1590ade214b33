#include "tools/welcomer/cli/PropertyListOutput.h"

#include <gtest/gtest.h>
#include <limits>
#include <sstream>

namespace welcomer::tool {
namespace {

using Array = PropertyList::Array;
using Dictionary = PropertyList::Dictionary;

std::string outlineText(const PropertyList& value) {
    std::string text;
    for (const std::string& line : outline(value, "  ")) {
        text += line + "\n";
    }
    return text;
}

TEST(ToJson, DataIsBase64AndADateIsISO8601InUTC) {
    EXPECT_EQ(toJson(PropertyList::Data{""}).dump(), "\"\"");
    EXPECT_EQ(toJson(PropertyList::Data{std::string("\0\xff!", 3)}).dump(), "\"AP8h\"");
    EXPECT_EQ(toJson(PropertyList::Date{86400}).dump(), "\"1970-01-02T00:00:00Z\"");
}

TEST(ToJson, NumbersAndBooleansKeepTheirKindAndRange) {
    EXPECT_EQ(toJson(true).dump(), "true");
    EXPECT_EQ(toJson(1).dump(), "1");
    EXPECT_EQ(toJson(1.0).dump(), "1.0");
    EXPECT_EQ(toJson(std::numeric_limits<std::int64_t>::min()).dump(), "-9223372036854775808");
    EXPECT_EQ(toJson(std::numeric_limits<std::uint64_t>::max()).dump(), "18446744073709551615");
}

TEST(ToJson, ContainersKeepTheirOrder) {
    const PropertyList value = Dictionary{{"b", Array{"x", Dictionary{}}}, {"a", Array{}}};
    EXPECT_EQ(toJson(value).dump(), R"({"a":[],"b":["x",{}]})");
}

TEST(PrintJson, BytesThatAreNoUTF8DoNotBreakTheDocument) {
    std::ostringstream out;
    printJson(out, toJson("a\xff"));
    EXPECT_EQ(out.str(), "\"a\\ufffd\"\n");
}

TEST(PrintJson, NothingInItCanControlATerminal) {
    std::string every; // control characters, and what reorders or ends a line
    for (const char* character : {"\x01", "\x1b", "\x7f", "\xc2\x80", "\xc2\x9b", "\xc2\x9f", "\xe2\x80\xa8",
                                  "\xe2\x80\xae", "\xe2\x81\xa6"}) {
        every += character;
    }
    std::ostringstream out;
    printJson(out, toJson(Dictionary{{every, every}}));
    const std::string escaped = "\"\\u0001\\u001b\\u007f\\u0080\\u009b\\u009f\\u2028\\u202e\\u2066\"";
    EXPECT_EQ(out.str(), "{\n  " + escaped + ": " + escaped + "\n}\n");
}

TEST(Outline, ShowsOneEntryPerLine) {
    const PropertyList value = Dictionary{{"aliases", Array{"one", "two"}},
                                          {"empty", Array{}},
                                          {"none", Dictionary{}},
                                          {"yes", true},
                                          {"nested", Dictionary{{"number", 7}}}};
    EXPECT_EQ(outlineText(value), "  aliases:\n"
                                  "    - one\n"
                                  "    - two\n"
                                  "  empty: (empty array)\n"
                                  "  nested:\n"
                                  "    number: 7\n"
                                  "  none: (empty dictionary)\n"
                                  "  yes: 1\n");
}

TEST(Outline, ShowsAValueThatIsNoContainer) {
    EXPECT_EQ(outlineText("only\ntext"), "  only\\ntext\n");
}

TEST(Outline, KeysCannotControlTheTerminal) {
    EXPECT_EQ(outlineText(Dictionary{{"\x1b[2J", 1}}), "  \\x1b[2J: 1\n");
}

} // namespace
} // namespace welcomer::tool
