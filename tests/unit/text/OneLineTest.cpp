#include "text/OneLine.h"

#include <gtest/gtest.h>

#include <string>

namespace welcomer::text {
namespace {

TEST(OneLine, WhatIsNoControlCharacterStaysAsItIs) {
    EXPECT_EQ(oneLine(""), "");
    EXPECT_EQ(oneLine("Zürich – 東京 \\n \u00a0 \U0001f426"), "Zürich – 東京 \\n \u00a0 \U0001f426");
}

TEST(OneLine, ControlCharactersAreEscaped) {
    EXPECT_EQ(oneLine("a\nb\tc\rd\x1b[2Je\x7f"), "a\\nb\\tc\\x0dd\\x1b[2Je\\x7f");
    EXPECT_EQ(oneLine(std::string(1, '\0')), "\\x00");
    EXPECT_EQ(oneLine("\u0080\u0085\u009f"), "\\x80\\x85\\x9f");
}

TEST(OneLine, LineAndParagraphSeparatorsAreEscaped) {
    EXPECT_EQ(oneLine("a\u2027\u2028\u2029\u202ab"), "a\u2027\\u{2028}\\u{2029}\u202ab");
}

TEST(OneLine, BytesThatAreNoUTF8StayAndHideNothing) {
    EXPECT_EQ(oneLine("\xc2\n\xe2\x80\n\n\x85"), "\xc2\\n\xe2\x80\\n\\n\x85");
}

TEST(OneLine, WhatIsTooLongEndsInAnEllipsisThatCounts) {
    EXPECT_EQ(oneLine("12345", 5), "12345");
    EXPECT_EQ(oneLine("123456", 5), "12…");
    EXPECT_EQ(oneLine("1234567890", 3), "…");
}

TEST(OneLine, ACutSplitsNeitherACharacterNorAnEscape) {
    EXPECT_EQ(oneLine("1é3456", 6), "1é…");
    EXPECT_EQ(oneLine("12é456", 6), "12…"); // the é would end one byte too late
    EXPECT_EQ(oneLine("1\n3456", 6), "1\\n…");
    EXPECT_EQ(oneLine("12\x1b", 5), "12…");
}

} // namespace
} // namespace welcomer::text
