#include "propertylist/XMLPropertyListReader.h"

#include <cmath>
#include <gtest/gtest.h>
#include <limits>

namespace welcomer {
namespace {

PropertyList read(std::string_view document) {
    PropertyListReadResult result = readXMLPropertyList(document);
    EXPECT_EQ(result.error, "") << document;
    return result.value.value_or("nothing read");
}

std::string errorOf(std::string_view document) {
    const PropertyListReadResult result = readXMLPropertyList(document);
    EXPECT_FALSE(result) << document;
    EXPECT_EQ(result.error.find('\n'), std::string::npos);
    return result.error;
}

std::string inPlist(std::string_view content) {
    return "<plist>" + std::string(content) + "</plist>";
}

PropertyList readIn(std::string_view content) {
    return read(inPlist(content));
}

// Columns count from the content: the 8 characters of the tag before it are taken off.
std::string errorIn(std::string_view content) {
    const std::string error = errorOf(inPlist(content));
    constexpr std::string_view prefix = "line 1, column ";
    if (!error.starts_with(prefix)) {
        return error;
    }
    std::size_t length = 0;
    const int column = std::stoi(error.substr(prefix.size()), &length);
    return std::to_string(column - 7) + error.substr(prefix.size() + length);
}

std::string repeated(std::string_view text, int times) {
    std::string result;
    for (int time = 0; time < times; ++time) {
        result += text;
    }
    return result;
}

// ---- Values

TEST(XMLPropertyListReader, ReadsEveryType) {
    EXPECT_EQ(readIn("<string>text</string>"), PropertyList("text"));
    EXPECT_EQ(readIn("<integer>-7</integer>"), PropertyList(-7));
    EXPECT_EQ(readIn("<real>0.5</real>"), PropertyList(0.5));
    EXPECT_EQ(readIn("<true/>"), PropertyList(true));
    EXPECT_EQ(readIn("<false/>"), PropertyList(false));
    EXPECT_EQ(readIn("<date>2001-02-03T04:05:06Z</date>"), PropertyList(PropertyList::Date{981173106}));
    EXPECT_EQ(readIn("<data>Zm9v</data>"), PropertyList(PropertyList::Data{"foo"}));
    EXPECT_EQ(readIn("<array><true/><array/></array>"),
              PropertyList(PropertyList::Array{true, PropertyList::Array()}));
    EXPECT_EQ(readIn("<dict><key>b</key><true/><key>a</key><dict></dict></dict>"),
              PropertyList(PropertyList::Dictionary{{"a", PropertyList()}, {"b", true}}));
}

TEST(XMLPropertyListReader, ReadsEmptyElementsInBothForms) {
    EXPECT_EQ(readIn("<string/>"), PropertyList(""));
    EXPECT_EQ(readIn("<string></string>"), PropertyList(""));
    EXPECT_EQ(readIn("<data/>"), PropertyList(PropertyList::Data()));
    EXPECT_EQ(readIn("<data></data>"), PropertyList(PropertyList::Data()));
    EXPECT_EQ(readIn("<array/>"), PropertyList(PropertyList::Array()));
    EXPECT_EQ(readIn("<array></array>"), PropertyList(PropertyList::Array()));
    EXPECT_EQ(readIn("<dict/>"), PropertyList());
    EXPECT_EQ(readIn("<true></true>"), PropertyList(true));
    EXPECT_EQ(readIn("<false> </false>"), PropertyList(false));
    EXPECT_EQ(readIn("<dict><key/><true/></dict>"), PropertyList(PropertyList::Dictionary{{"", true}}));
}

TEST(XMLPropertyListReader, IntegersCoverBothSignedAndUnsignedRanges) {
    EXPECT_EQ(readIn("<integer>18446744073709551615</integer>"),
              PropertyList(std::numeric_limits<std::uint64_t>::max()));
    EXPECT_EQ(readIn("<integer>-9223372036854775808</integer>"),
              PropertyList(std::numeric_limits<std::int64_t>::min()));
    EXPECT_EQ(readIn("<integer>+5</integer>"), PropertyList(5));
    EXPECT_EQ(readIn("<integer> 5\n</integer>"), PropertyList(5));
    EXPECT_EQ(readIn("<integer>0xFf</integer>"), PropertyList(255));
    EXPECT_EQ(readIn("<integer>-0x1</integer>"), PropertyList(-1));
    EXPECT_EQ(readIn("<integer>-0</integer>"), PropertyList(0));
}

TEST(XMLPropertyListReader, RefusesIntegersBeyond64Bits) {
    EXPECT_EQ(errorIn("<integer>18446744073709551616</integer>"), "1: the integer does not fit 64 bits");
    EXPECT_EQ(errorIn("<integer>-9223372036854775809</integer>"), "1: the integer does not fit 64 bits");
}

TEST(XMLPropertyListReader, RefusesMalformedNumbers) {
    for (const char* text : {"", " ", "-", "+-1", "1.5", "1 2", "0x", "x", "1e3"}) {
        EXPECT_EQ(errorIn(std::string("<integer>") + text + "</integer>"), "1: malformed integer") << text;
    }
    EXPECT_EQ(errorIn("<integer/>"), "1: malformed integer");
    for (const char* text : {"", "x", "1e999"}) {
        EXPECT_EQ(errorIn(std::string("<real>") + text + "</real>"), "1: malformed real, or one out of range")
            << text;
    }
}

TEST(XMLPropertyListReader, ReadsRealsOfAllKinds) {
    EXPECT_EQ(readIn("<real> -1e-3 </real>"), PropertyList(-0.001));
    EXPECT_EQ(readIn("<real>-infinity</real>"), PropertyList(-std::numeric_limits<double>::infinity()));
    EXPECT_TRUE(std::isnan(readIn("<real>nan</real>").real().value()));
}

TEST(XMLPropertyListReader, RefusesMalformedDates) {
    EXPECT_EQ(errorIn("<date>yesterday</date>"), "1: malformed date, or one that does not exist");
    EXPECT_EQ(errorIn("<date>2001-02-30T00:00:00Z</date>"), "1: malformed date, or one that does not exist");
    EXPECT_EQ(errorIn("<date/>"), "1: malformed date, or one that does not exist");
}

TEST(XMLPropertyListReader, ReadsDataWithWhiteSpaceMarkupAndReferences) {
    const PropertyList data(PropertyList::Data{"foo"});
    EXPECT_EQ(readIn("<data>\n\tZm\r\n\t9v \n</data>"), data);
    EXPECT_EQ(readIn("<data>Zm<!-- half -->9v</data>"), data);
    EXPECT_EQ(readIn("<data><![CDATA[Zm9v]]></data>"), data);
    EXPECT_EQ(readIn("<data>Zm&#57;v</data>"), data);
}

TEST(XMLPropertyListReader, RefusesMalformedData) {
    EXPECT_EQ(errorIn("<data>Zm9v*</data>"), "11: malformed base64");
    EXPECT_EQ(errorIn("<data>Zm9</data>"), "10: malformed base64");
    EXPECT_EQ(errorIn("<data>Zm<!-- -->9</data>"), "1: malformed base64");
    EXPECT_EQ(errorIn("<data>Zm9v<true/></data>"), "11: expected </data>, found <true/>");
}

TEST(XMLPropertyListReader, RefusesTextInBooleans) {
    EXPECT_EQ(errorIn("<true>yes</true>"), "1: unexpected text in <true>");
}

TEST(XMLPropertyListReader, TheLastOfEqualKeysCounts) {
    EXPECT_EQ(readIn("<dict><key>k</key><true/><key>a</key><true/><key>k</key><false/></dict>"),
              PropertyList(PropertyList::Dictionary{{"a", true}, {"k", false}}));
}

// ---- Text

TEST(XMLPropertyListReader, KeepsWhiteSpaceInStrings) {
    EXPECT_EQ(readIn("<string> a\n\tb </string>"), PropertyList(" a\n\tb "));
}

TEST(XMLPropertyListReader, FindsTheEndOfTextOfEveryLength) {
    for (int length = 0; length < 40; ++length) {
        const std::string text(static_cast<std::size_t>(length), 'x');
        EXPECT_EQ(readIn("<string>" + text + "</string>"), PropertyList(text));
        EXPECT_EQ(readIn("<string>" + text + "&lt;" + text + "</string>"), PropertyList(text + "<" + text));
    }
}

TEST(XMLPropertyListReader, ResolvesThePredefinedEntities) {
    EXPECT_EQ(readIn("<string>&lt;&gt;&amp;&quot;&apos;</string>"), PropertyList("<>&\"'"));
    EXPECT_EQ(readIn("<dict><key>a&amp;b</key><true/></dict>"),
              PropertyList(PropertyList::Dictionary{{"a&b", true}}));
}

TEST(XMLPropertyListReader, ResolvesCharactersByNumber) {
    EXPECT_EQ(readIn("<string>&#65;&#x42;&#xe9;&#x20AC;&#x1F600;&#13;</string>"),
              PropertyList("AB\xC3\xA9\xE2\x82\xAC\xF0\x9F\x98\x80\r"));
}

TEST(XMLPropertyListReader, RefusesOtherEntities) {
    EXPECT_EQ(errorIn("<string>ab&nbsp;</string>"), "11: unknown entity &nbsp;");
    EXPECT_EQ(errorIn("<string>&a" + std::string(100, 'b') + ";</string>"),
              "9: unknown entity &a" + std::string(39, 'b') + "...;");
}

TEST(XMLPropertyListReader, RefusesMalformedReferences) {
    for (const char* text : {"&", "& ", "&;x", "&lt", "&#;", "&#x;", "&#xg;", "&#65", "&#-65;"}) {
        const std::string error = errorIn(std::string("<string>") + text + "</string>");
        EXPECT_EQ(error, std::string_view(text) == "&;x" ? "9: unknown entity &;" : "9: malformed reference")
            << text;
    }
}

TEST(XMLPropertyListReader, RefusesReferencesToWhatIsNoXMLCharacter) {
    for (const char* number : {"0", "1", "x1F", "xD800", "xFFFE", "x110000", "99999999999999999999"}) {
        EXPECT_EQ(errorIn(std::string("<string>&#") + number + ";</string>"),
                  "9: XML has no place for the character of this reference")
            << number;
    }
}

TEST(XMLPropertyListReader, TakesCharacterDataAsItStands) {
    EXPECT_EQ(readIn("<string>a<![CDATA[<b>&amp;\r\n]]]]><![CDATA[>]]>c</string>"),
              PropertyList("a<b>&amp;\n]]>c"));
    EXPECT_EQ(errorIn("<string><![CDATA[</string>"), "9: unterminated CDATA section");
    EXPECT_EQ(errorIn("<array><![CDATA[]]></array>"), "8: unexpected CDATA section");
}

TEST(XMLPropertyListReader, EveryLineEndIsALineFeed) {
    EXPECT_EQ(readIn("<string>a\r\nb\rc\n\rd</string>"), PropertyList("a\nb\nc\n\nd"));
}

TEST(XMLPropertyListReader, PassesOverCommentsAndInstructionsInText) {
    EXPECT_EQ(readIn("<string>a<!-- <b> & -->c<?d <e> ?>f</string>"), PropertyList("acf"));
}

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

// ---- Bounds and positions

TEST(XMLPropertyListReader, ReadsTheGreatestDepthAndRefusesMore) {
    constexpr int most = kPropertyListMaximumDepth;
    EXPECT_TRUE(readXMLPropertyList(inPlist(repeated("<array>", most) + repeated("</array>", most))));
    EXPECT_EQ(errorIn(repeated("<array>", most + 1) + repeated("</array>", most + 1)),
              "3641: nested more than 520 deep");
    const std::string dictionaries = repeated("<dict><key>k</key>", most - 1);
    EXPECT_TRUE(readXMLPropertyList(inPlist(dictionaries + "<dict></dict>" + repeated("</dict>", most - 1))));
    EXPECT_EQ(errorIn(dictionaries + "<array><dict></dict></array>" + repeated("</dict>", most - 1)),
              "9350: nested more than 520 deep");
}

TEST(XMLPropertyListReader, EmptyElementsAreALevelToo) {
    const std::string arrays = repeated("<array>", kPropertyListMaximumDepth - 1);
    const std::string end = repeated("</array>", kPropertyListMaximumDepth - 1);
    for (const char* empty : {"<array/>", "<dict/>"}) {
        EXPECT_TRUE(readXMLPropertyList(inPlist(arrays + empty + empty + end)));
        EXPECT_EQ(errorIn("<array>" + arrays + empty + end + "</array>"), "3641: nested more than 520 deep");
    }
}

TEST(XMLPropertyListReader, DepthIsNesting) {
    const std::string document = inPlist("<array>" + repeated("<array><true/></array>", 2000) + "</array>");
    EXPECT_EQ(read(document).array()->size(), 2000U);
}

TEST(XMLPropertyListReader, RefusesAHundredThousandLevels) {
    EXPECT_EQ(errorIn(repeated("<array>", 100000)), "3641: nested more than 520 deep");
    EXPECT_EQ(errorIn(repeated("<dict><key>k</key>", 100000)), "9361: nested more than 520 deep");
}

TEST(XMLPropertyListReader, LinesAndColumnsCountCharacters) {
    EXPECT_EQ(errorOf("<plist>\n\r\n\r<string>\xE2\x82\xAC\xC3\xA9</string><set/>"),
              "line 4, column 20: unknown element <set>");
    EXPECT_EQ(errorOf("\xEF\xBB\xBF<set/>"), "line 1, column 1: unknown element <set>");
}

TEST(XMLPropertyListReader, ReadsDataOf64MiB) {
    std::string document = "<plist><data>";
    document.reserve(100 << 20);
    constexpr std::size_t groups = (std::size_t{64} << 20) / 3;
    for (std::size_t group = 0; group < groups; ++group) {
        document += "Zm9v";
    }
    document += "</data></plist>";
    const PropertyList value = read(document);
    ASSERT_TRUE(value.data());
    EXPECT_EQ(value.data()->bytes.size(), groups * 3);
    EXPECT_TRUE(value.data()->bytes.ends_with("foofoo"));
    EXPECT_LT(value.data()->bytes.capacity(), groups * 3 + 64) << "room beyond what is needed";
}

} // namespace
} // namespace welcomer
