#include "propertylist/Base64.h"

#include <gtest/gtest.h>

namespace welcomer {
namespace {

std::string encoded(std::string_view bytes) {
    std::string text;
    appendBase64(text, bytes);
    return text;
}

std::string decoded(std::string_view text) {
    std::string bytes;
    EXPECT_EQ(decodeBase64(text, bytes), std::string_view::npos) << text;
    return bytes;
}

std::size_t offsetOfError(std::string_view text) {
    std::string bytes;
    return decodeBase64(text, bytes);
}

TEST(Base64, EncodesEveryRemainder) {
    EXPECT_EQ(encoded(""), "");
    EXPECT_EQ(encoded("f"), "Zg==");
    EXPECT_EQ(encoded("fo"), "Zm8=");
    EXPECT_EQ(encoded("foo"), "Zm9v");
    EXPECT_EQ(encoded("foobar"), "Zm9vYmFy");
    EXPECT_EQ(encoded("\xFB\xFF\xFE"), "+//+");
}

TEST(Base64, AppendsToWhatIsThere) {
    std::string text = "data:";
    appendBase64(text, "foo");
    EXPECT_EQ(text, "data:Zm9v");
}

TEST(Base64, DecodesEveryRemainder) {
    EXPECT_EQ(decoded(""), "");
    EXPECT_EQ(decoded("Zg=="), "f");
    EXPECT_EQ(decoded("Zm8="), "fo");
    EXPECT_EQ(decoded("Zm9v"), "foo");
    EXPECT_EQ(decoded("+//+"), "\xFB\xFF\xFE");
}

TEST(Base64, WhiteSpaceMayStandAnywhere) {
    EXPECT_EQ(decoded(" \n\tZ m\r\n9v Zg\n=\t= "), "foof");
}

TEST(Base64, EveryByteComesBackAtEveryLength) {
    std::string bytes;
    for (int byte = 0; byte < 256; ++byte) {
        bytes += static_cast<char>(byte * 7);
        EXPECT_EQ(decoded(encoded(bytes)), bytes);
    }
}

TEST(Base64, RefusesWhatIsNoBase64AndSaysWhere) {
    EXPECT_EQ(offsetOfError("Zm9v*"), 4U);
    EXPECT_EQ(offsetOfError("Zm9v Z-9v"), 6U);
    EXPECT_EQ(offsetOfError("Zm9v\x80"), 4U);
    EXPECT_EQ(offsetOfError(std::string_view("Zm\0v", 4)), 2U);
}

TEST(Base64, RefusesAnIncompleteGroup) {
    EXPECT_EQ(offsetOfError("Z"), 1U);
    EXPECT_EQ(offsetOfError("Zm"), 2U);
    EXPECT_EQ(offsetOfError("Zm9"), 3U);
    EXPECT_EQ(offsetOfError("Zm="), 3U);
}

TEST(Base64, RefusesMisplacedPadding) {
    EXPECT_EQ(offsetOfError("="), 0U);
    EXPECT_EQ(offsetOfError("Z==="), 1U);
    EXPECT_EQ(offsetOfError("Zm9v="), 4U);
    EXPECT_EQ(offsetOfError("Zm9="
                            "Zm9v"),
              4U);
    EXPECT_EQ(offsetOfError("Zg=a"), 3U);
    EXPECT_EQ(offsetOfError("Zg==="), 4U);
}

} // namespace
} // namespace welcomer
