#include "tools/welcomer/terminal/Printable.h"

#include <gtest/gtest.h>

namespace welcomer::tool {
namespace {

TEST(Printable, PlainTextAndUTF8StayAsTheyAre) {
    EXPECT_EQ(printable("Zürich – 東京 \\n"), "Zürich – 東京 \\n");
}

TEST(Printable, ControlCharactersCannotReachTheTerminal) {
    EXPECT_EQ(printable("a\nb\tc\x1b[2Jd\x7f"
                        "e\r"),
              "a\\nb\\tc\\x1b[2Jd\\x7fe\\x0d");
    EXPECT_EQ(printable(std::string_view("\0", 1)), "\\x00");
}

TEST(Printable, ControlCharactersBeyondAsciiCannotEither) {
    EXPECT_EQ(printable("\xc2\x9b"
                        "2J"),
              "\\x9b2J");
    EXPECT_EQ(printable("\xc2\xa0"), "\xc2\xa0"); // the first one that is none
    EXPECT_EQ(printable("\xc2"), "\xc2");
    EXPECT_EQ(printable("\u2028"), "\\u{2028}");
}

TEST(Printable, ColumnsCountCharactersNotBytes) {
    EXPECT_EQ(columns(""), 0U);
    EXPECT_EQ(columns("Zürich"), 6U);
}

TEST(Printable, ColumnsCountWideCharactersTwiceAndCombiningOnesNotAtAll) {
    EXPECT_EQ(columns("東京"), 4U);
    EXPECT_EQ(columns("e\u0301"), 1U);
    EXPECT_EQ(columns("\xff\xc2"), 2U); // no UTF-8
}

TEST(Printable, WhatIsCutEndsWhereACharacterEnds) {
    EXPECT_EQ(cutTo("Zürich", 6), "Zürich");
    EXPECT_EQ(cutTo("Zürich", 3), "Zü…");
    EXPECT_EQ(cutTo("東京都", 4), "東…"); // the next one would take two
    EXPECT_EQ(cutTo("Zürich", 1), "…");
}

} // namespace
} // namespace welcomer::tool
