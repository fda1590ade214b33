#include "propertylist/UTF8.h"

#include <gtest/gtest.h>

namespace welcomer {
namespace {

constexpr std::size_t kAllValid = std::string_view::npos;

TEST(UTF8, AcceptsEveryLengthAndItsBounds) {
    for (const std::string_view text :
         {"", "plain", "\x7F", "\xC2\x80", "\xDF\xBF", "\xE0\xA0\x80", "\xED\x9F\xBF", "\xEE\x80\x80",
          "\xEF\xBF\xBF", "\xF0\x90\x80\x80", "\xF4\x8F\xBF\xBF"}) {
        EXPECT_EQ(findInvalidUTF8(text), kAllValid) << text;
    }
}

TEST(UTF8, RefusesMalformedSequences) {
    for (const std::string_view text :
         {"\x80", "\xBF", "\xC0\x80", "\xC1\xBF", "\xC2", "\xC2 ", "\xE0\x80\x80", "\xE0\x9F\xBF",
          "\xED\xA0\x80", "\xED\xBF\xBF", "\xE2\x82", "\xE2\x28\xA1", "\xF0\x8F\xBF\xBF", "\xF4\x90\x80\x80",
          "\xF5\x80\x80\x80", "\xF0\x9F\x98", "\xFE", "\xFF"}) {
        EXPECT_EQ(findInvalidUTF8("ab" + std::string(text)), 2U);
        EXPECT_EQ(findInvalidXMLText("ab" + std::string(text)), 2U);
        EXPECT_EQ(describeInvalidXMLText("ab" + std::string(text), 2), "invalid UTF-8");
    }
}

TEST(UTF8, FindsTheFirstErrorWhereverBlocksBegin) {
    for (std::size_t offset = 0; offset < 300; ++offset) {
        std::string text(400, 'x');
        text.replace(100, 2, "\xC3\xA9");
        if (offset == 101) {
            continue; // would leave 100 without its second byte
        }
        text[offset] = '\xFF';
        EXPECT_EQ(findInvalidUTF8(text), offset == 100 ? 100 : offset);
        text[offset] = '\x01';
        EXPECT_EQ(findInvalidXMLText(text), offset);
    }
}

TEST(UTF8, ASequenceMayCrossBlocks) {
    for (std::size_t offset = 55; offset < 70; ++offset) {
        std::string text(200, 'x');
        text.replace(offset, 4, "\xF0\x9F\x98\x80");
        EXPECT_EQ(findInvalidUTF8(text), kAllValid);
        EXPECT_EQ(findInvalidXMLText(text), kAllValid);
    }
}

TEST(UTF8, XMLHasNoPlaceForControlCharacters) {
    for (char character = 0; character < 0x20; ++character) {
        const std::string text(1, character);
        EXPECT_EQ(findInvalidUTF8(text), kAllValid);
        const bool isAllowed = character == '\t' || character == '\n' || character == '\r';
        EXPECT_EQ(findInvalidXMLText(text), isAllowed ? kAllValid : 0U);
    }
    EXPECT_EQ(describeInvalidXMLText("\x01", 0), "U+0001");
}

TEST(UTF8, XMLHasNoPlaceForNoncharacters) {
    EXPECT_EQ(findInvalidXMLText("\xEF\xBF\xBD"), kAllValid);
    EXPECT_EQ(findInvalidXMLText("\xEF\xBF\xBE"), 0U);
    EXPECT_EQ(findInvalidXMLText("\xEF\xBF\xBF"), 0U);
    EXPECT_EQ(describeInvalidXMLText("\xEF\xBF\xBE", 0), "U+FFFE");
    EXPECT_FALSE(isXMLCharacter(0xD800));
    EXPECT_FALSE(isXMLCharacter(0x110000));
    EXPECT_TRUE(isXMLCharacter(0x10FFFF));
}

TEST(UTF8, AppendsEveryLength) {
    std::string text;
    for (const char32_t character : {U'\x41', U'\x7FF', U'\x20AC', U'\x1F600'}) {
        appendUTF8(text, character);
    }
    EXPECT_EQ(text, "A\xDF\xBF\xE2\x82\xAC\xF0\x9F\x98\x80");
}

TEST(UTF8, JoinsSurrogates) {
    EXPECT_TRUE(isHighSurrogate(0xD83D));
    EXPECT_FALSE(isHighSurrogate(0xDE00));
    EXPECT_TRUE(isLowSurrogate(0xDE00));
    EXPECT_FALSE(isLowSurrogate(0xE000));
    EXPECT_EQ(joinSurrogates(0xD83D, 0xDE00), 0x1F600U);
}

} // namespace
} // namespace welcomer
