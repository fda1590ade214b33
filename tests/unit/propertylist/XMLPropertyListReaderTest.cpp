// Values, text and bounds.

#include "propertylist/XMLPropertyListReader.h"
#include "tests/unit/propertylist/XMLPropertyListReaderFixture.h"

#include <cmath>
#include <limits>

namespace welcomer {
namespace {

using namespace xml_reading;

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

TEST(XMLPropertyListReader, EqualKeysAreRefusedWhereTheyAreToBe) {
    const auto errorOf = [](const char* content) {
        return readXMLPropertyListWithUniqueKeys(inPlist(content)).error;
    };
    EXPECT_EQ(errorOf("<dict><key>a</key><true/><key>b</key><true/></dict>"), "");
    EXPECT_EQ(errorOf("<array><dict><key>a</key><true/></dict><dict><key>a</key><true/></dict></array>"), "");
    EXPECT_EQ(errorOf("<dict><key>a</key><true/><key>&#97;</key><true/></dict>"),
              "line 1, column 33: the key \"a\" appears twice");
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
