// Markup, and what stands before it.

#include "propertylist/XMLPropertyListReader.h"
#include "tests/unit/propertylist/XMLPropertyListReaderFixture.h"

namespace welcomer {
namespace {

using namespace xml_reading;

// ---- Markup

TEST(XMLPropertyListReader, PassesOverCommentsInstructionsAndWhiteSpaceBetweenElements) {
    EXPECT_EQ(
        read("<?xml version='1.0'?> <!-- a --> <?b c?>\n<plist version=\"1.0\"> <!----> <dict> <?d?>"
             "<key>k</key> <!-- e --> <array> <?f?> <true/> </array> </dict > </plist >\n<!-- g --><?h?>\n"),
        PropertyList(PropertyList::Dictionary{{"k", PropertyList::Array{true}}}));
}

TEST(XMLPropertyListReader, IgnoresWellFormedAttributes) {
    EXPECT_EQ(read("<plist version='1.0' xmlns:a=\"b>c\"><true  a = 'b' /></plist>"), PropertyList(true));
}

TEST(XMLPropertyListReader, RefusesMalformedAttributes) {
    EXPECT_EQ(errorIn("<string a>b</string>"), "9: malformed attribute");
    EXPECT_EQ(errorIn("<string a=b>c</string>"), "9: the value of an attribute must be quoted");
    EXPECT_EQ(errorIn("<string a='b>c</string>"), "9: unterminated attribute");
    EXPECT_EQ(errorIn("<string a='<'>c</string>"), "12: \"<\" within an attribute");
    EXPECT_EQ(errorIn("<string a='b'c='d'>e</string>"), "1: malformed tag <string>");
}

TEST(XMLPropertyListReader, RefusesUnknownElements) {
    EXPECT_EQ(errorIn("<set/>"), "1: unknown element <set>");
    EXPECT_EQ(errorIn("<strings></strings>"), "1: unknown element <strings>");
    EXPECT_EQ(errorIn("<DICT/>"), "1: unknown element <DICT>");
    EXPECT_EQ(errorIn("<\xC3\xA9/>"), "1: unknown element <\?\?>");
    EXPECT_EQ(errorIn("<>"), "1: malformed tag");
    EXPECT_EQ(errorIn("< true/>"), "1: malformed tag");
}

TEST(XMLPropertyListReader, RefusesElementsThatDoNotMatch) {
    EXPECT_EQ(errorIn("<string>a</key>"), "10: expected </string>, found </key>");
    EXPECT_EQ(errorIn("<string>a<true/></string>"), "10: expected </string>, found <true/>");
    EXPECT_EQ(errorIn("<string>a</string/>"), "10: malformed tag </string>");
    EXPECT_EQ(errorIn("<array></dict>"), "8: unexpected </dict>");
    EXPECT_EQ(errorIn("<dict></array>"), "7: expected <key> or </dict>, found </array>");
}

TEST(XMLPropertyListReader, RefusesDictionariesWithoutKeysOrValues) {
    EXPECT_EQ(errorIn("<dict><true/></dict>"), "7: expected <key> or </dict>, found <true/>");
    EXPECT_EQ(errorIn("<dict><key>a</key></dict>"), "7: a key without a value");
    EXPECT_EQ(errorIn("<dict><key>a</key><key>b</key></dict>"), "19: expected a value, found <key>");
    EXPECT_EQ(errorIn("<array><key>b</key></array>"), "8: expected a value, found <key>");
    EXPECT_EQ(errorIn("<plist/>"), "1: expected a value, found <plist/>");
}

TEST(XMLPropertyListReader, RefusesTextBetweenElements) {
    EXPECT_EQ(errorIn("<array>a</array>"), "8: unexpected text in <array>");
    EXPECT_EQ(errorIn("<dict>a</dict>"), "7: unexpected text in <dict>");
    EXPECT_EQ(errorIn("a<dict/>"), "1: unexpected text in <plist>");
    EXPECT_EQ(errorIn("<dict/>&amp;"), "8: unexpected text in <plist>");
}

TEST(XMLPropertyListReader, RefusesAWrongTopElement) {
    EXPECT_EQ(errorOf("<dict/>"), "line 1, column 1: expected <plist>, found <dict/>");
    EXPECT_EQ(errorOf("<html/>"), "line 1, column 1: unknown element <html>");
    EXPECT_EQ(errorOf("</plist>"), "line 1, column 1: expected <plist>, found </plist>");
    EXPECT_EQ(errorOf("text"), "line 1, column 1: unexpected text before <plist>");
    EXPECT_EQ(errorOf(""), "line 1, column 1: no <plist> element");
    EXPECT_EQ(errorOf("<?xml version='1.0'?>\n"), "line 2, column 1: no <plist> element");
}

TEST(XMLPropertyListReader, TakesExactlyOneValue) {
    EXPECT_EQ(errorOf("<plist/>"), "line 1, column 1: <plist/> holds no value");
    EXPECT_EQ(errorIn(" "), "2: <plist> holds no value");
    EXPECT_EQ(errorIn("<true/><true/>"), "8: expected </plist> after the top-level value, found <true/>");
}

TEST(XMLPropertyListReader, NothingMayFollowTheTopLevelValue) {
    EXPECT_EQ(errorOf("<plist><true/></plist>\n x"), "line 2, column 2: unexpected content after </plist>");
    EXPECT_EQ(errorOf("<plist><true/></plist><plist/>"),
              "line 1, column 23: unexpected content after </plist>");
    EXPECT_EQ(errorOf("<plist><true/></plist><"), "line 1, column 23: unexpected content after </plist>");
    EXPECT_EQ(errorOf("<plist><true/></plist><!-- "), "line 1, column 23: unterminated comment");
}

TEST(XMLPropertyListReader, RefusesMalformedCommentsAndInstructions) {
    EXPECT_EQ(errorIn("<!-- a -- b --><true/>"), "8: \"--\" within a comment");
    EXPECT_EQ(errorIn("<!- a -><true/>"), "1: malformed tag");
    EXPECT_EQ(errorIn("<!-- a"), "1: unterminated comment");
    EXPECT_EQ(errorIn("<?a <true/>"), "1: unterminated processing instruction");
    EXPECT_EQ(errorIn("<? a?><true/>"), "1: a processing instruction without a name");
    EXPECT_EQ(errorIn("<?XML a?><true/>"), "1: an XML declaration may stand at the beginning only");
}

TEST(XMLPropertyListReader, RefusesEveryTruncatedDocument) {
    const std::string document =
        "<?xml version=\"1.0\" encoding=\"UTF-8\"?><!DOCTYPE plist PUBLIC \"a\" \"b\"><plist "
        "version=\"1.0\"><dict>"
        "<key>k</key><array><string>a&amp;<![CDATA[b]]><!-- c --><?d?>\r\n</string><data>Zm9v</data><true/>"
        "<integer>1</integer><real>2</real><date>2001-02-03T04:05:06Z</date></array></dict></plist>";
    ASSERT_TRUE(readXMLPropertyList(document));
    for (std::size_t length = 0; length < document.size(); ++length) {
        // A copy of its own, so that the address sanitizer sees a read beyond its end.
        const std::string truncated = document.substr(0, length);
        EXPECT_NE(errorOf(truncated), "");
    }
}

// ---- Prolog

TEST(XMLPropertyListReader, PassesOverADocumentType) {
    EXPECT_EQ(read("<!DOCTYPE plist><plist><true/></plist>"), PropertyList(true));
    EXPECT_EQ(
        read("<?xml version='1.0'?>\n<!DOCTYPE plist PUBLIC \"-//Example//[>\" 'http://example.invalid/>'>\n"
             "<plist><true/></plist>"),
        PropertyList(true));
}

TEST(XMLPropertyListReader, RefusesAnInternalSubset) {
    EXPECT_EQ(errorOf("<!DOCTYPE plist [<!ENTITY a 'b'>]><plist><string>&a;</string></plist>"),
              "line 1, column 17: a document type with an internal subset is not allowed");
    EXPECT_EQ(errorOf("<!DOCTYPE plist SYSTEM 'a' [ ]><plist><true/></plist>"),
              "line 1, column 28: a document type with an internal subset is not allowed");
}

TEST(XMLPropertyListReader, RefusesMalformedOrMisplacedDocumentTypes) {
    EXPECT_EQ(errorOf("<!DOCTYPE plist"), "line 1, column 1: unterminated document type declaration");
    EXPECT_EQ(errorOf("<!DOCTYPE plist 'a><plist/>"),
              "line 1, column 1: unterminated document type declaration");
    EXPECT_EQ(errorOf("<!DOCTYPE plist <plist/>"),
              "line 1, column 1: unterminated document type declaration");
    EXPECT_EQ(errorOf("<!DOCTYPE plist><!DOCTYPE plist><plist/>"),
              "line 1, column 17: a document type declaration may stand before <plist> only");
    EXPECT_EQ(errorIn("<!DOCTYPE plist><true/>"),
              "1: a document type declaration may stand before <plist> only");
}

TEST(XMLPropertyListReader, AcceptsUTF8UnderItsNameAndWithAByteOrderMark) {
    EXPECT_EQ(read("<?xml version=\"1.0\" encoding='utf-8' standalone='yes' ?><plist><true/></plist>"),
              PropertyList(true));
    EXPECT_EQ(read("\xEF\xBB\xBF<?xml version=\"1.0\" encoding=\"UTF-8\"?><plist><true/></plist>"),
              PropertyList(true));
    EXPECT_EQ(read("\n <?xml version=\"1.0\"?><plist><true/></plist>"), PropertyList(true));
}

TEST(XMLPropertyListReader, RefusesOtherEncodings) {
    EXPECT_EQ(errorOf("<?xml version=\"1.0\" encoding=\"ISO-8859-1\"?><plist><true/></plist>"),
              "line 1, column 21: the encoding ISO-8859-1 is not supported, only UTF-8 is");
    EXPECT_EQ(errorOf("<?xml version=\"1.0\" encoding=\"\"?><plist><true/></plist>"),
              "line 1, column 21: the encoding  is not supported, only UTF-8 is");
}

TEST(XMLPropertyListReader, RefusesAMalformedDeclaration) {
    EXPECT_EQ(errorOf("<?xml version='1.0'encoding='UTF-8'?><plist/>"),
              "line 1, column 1: malformed XML declaration");
    EXPECT_EQ(errorOf("<?xml "), "line 1, column 1: malformed XML declaration");
    EXPECT_EQ(errorOf("<?xml version?>"), "line 1, column 7: malformed attribute");
}

TEST(XMLPropertyListReader, RefusesInvalidUTF8Anywhere) {
    EXPECT_EQ(errorIn("<string>\xFF</string>"), "9: invalid UTF-8");
    EXPECT_EQ(errorIn("<!-- \xC3( --><true/>"), "6: invalid UTF-8");
    EXPECT_EQ(errorOf(inPlist("<true/>") + "\x80"), "line 1, column 23: invalid UTF-8");
}

TEST(XMLPropertyListReader, RefusesCharactersThatXMLHasNoPlaceFor) {
    EXPECT_EQ(errorIn("<string>\x01</string>"), "9: XML has no place for the character U+0001");
    EXPECT_EQ(errorIn(std::string_view("<string>\0</string>", 18)),
              "9: XML has no place for the character U+0000");
}

} // namespace
} // namespace welcomer
