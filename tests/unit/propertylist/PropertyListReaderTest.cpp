#include "propertylist/PropertyListReader.h"

#include "propertylist/PropertyListReadError.h"

#include <gtest/gtest.h>

namespace welcomer {
namespace {

using namespace std::string_view_literals;

std::string errorOf(std::string_view bytes) {
    const PropertyListReadResult result = readPropertyList(bytes);
    EXPECT_FALSE(result);
    return result.error;
}

PropertyList read(std::string_view bytes) {
    const PropertyListReadResult result = readPropertyList(bytes);
    EXPECT_EQ(result.error, "");
    return result.value.value_or("nothing read");
}

TEST(PropertyListReader, TellsTheFormatsApartByContent) {
    EXPECT_EQ(read("<plist><true/></plist>"), PropertyList(true));
    EXPECT_EQ(read("\xEF\xBB\xBF \n<!-- a --><plist><true/></plist>"), PropertyList(true));
    EXPECT_EQ(
        read("bplist00\x09\x08\0\0\0\0\0\0\x01\x01\0\0\0\0\0\0\0\x01\0\0\0\0\0\0\0\0\0\0\0\0\0\0\0\x09"sv),
        PropertyList(true));
    EXPECT_EQ(read(" {a = b;}"), PropertyList(PropertyList::Dictionary{{"a", "b"}}));
    EXPECT_EQ(read("\xEF\xBB\xBFword"), PropertyList("word"));
}

TEST(PropertyListReader, HexadecimalDigitsInAngleBracketsAreData) {
    EXPECT_EQ(read("<dada>"), PropertyList(PropertyList::Data{"\xDA\xDA"}));
    EXPECT_EQ(read(" < 66 >"), PropertyList(PropertyList::Data{"f"}));
    EXPECT_EQ(read("<>"), PropertyList(PropertyList::Data()));
    EXPECT_EQ(errorOf("<data>Zm9v</data>"), "line 1, column 1: expected <plist>, found <data>");
    EXPECT_EQ(errorOf("<dict/>"), "line 1, column 1: expected <plist>, found <dict/>");
}

TEST(PropertyListReader, RefusesEmptyData) {
    EXPECT_EQ(errorOf(""), "byte 0: the data is empty");
    EXPECT_EQ(errorOf(" \n"), "line 2, column 1: there is no value");
}

TEST(PropertyListReader, RefusesUTF16) {
    EXPECT_EQ(errorOf("\xFF\xFE<\0"sv), "byte 0: the encoding UTF-16 is not supported, only UTF-8 is");
    EXPECT_EQ(errorOf("\xFE\xFF\0<"sv), "byte 0: the encoding UTF-16 is not supported, only UTF-8 is");
    EXPECT_EQ(errorOf("<\0?\0"sv), "line 1, column 2: XML has no place for the character U+0000");
}

TEST(PropertyListReader, RefusesWhatIsInNoFormat) {
    EXPECT_EQ(errorOf("\x89PNG\r\n"), "line 1, column 1: invalid UTF-8");
    EXPECT_EQ(errorOf("just some words"), "line 1, column 6: unexpected content after the top-level value");
    EXPECT_EQ(errorOf("\0\0"sv), "line 1, column 1: expected a value, found \"?\"");
}

TEST(PropertyListReader, AnExcerptIsShortAndPrintable) {
    EXPECT_EQ(excerpt("a\nb\x80"), "a?b?");
    EXPECT_EQ(excerpt(std::string(40, 'x')), std::string(40, 'x'));
    EXPECT_EQ(excerpt(std::string(41, 'x')), std::string(40, 'x') + "...");
}

} // namespace
} // namespace welcomer
