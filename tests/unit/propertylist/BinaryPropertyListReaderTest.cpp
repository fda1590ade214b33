// Values.

#include "propertylist/BinaryPropertyListReader.h"
#include "tests/unit/propertylist/BinaryPropertyListReaderFixture.h"

#include <bit>
#include <cstdint>
#include <limits>

namespace welcomer {
namespace {

using namespace binary_reading;

TEST(BinaryPropertyListReader, ReadsWhatAnotherWriterMade) {
    const std::string bytes = fromHexadecimal(
        "62706c6973743030d90102030405060708090a141516171818191a55617272617954646174615464617465546c6f6e67"
        "526e6f5473616d65547465787457756e69636f646553796573a90b0c0d0e0f10111213100113ffffffffffffffff10ff"
        "11ffff12800000001400000000000000008000000000000000138000000000000000140000000000000000ffffffffff"
        "ffffff233fb999999999999a4200ff334145dd79000000005f1014787878787878787878787878787878787878787808"
        "55706c61696e6320acd83dde0009081b21262b3033383d454953555e6063687982939c9fa8bfc0c6cd00000000000001"
        "01000000000000001b000000000000000000000000000000ce");
    EXPECT_EQ(read(bytes), PropertyList(Dictionary{
                               {"array", Array{1, -1, 255, 65535, 1LL << 31, 1ULL << 63,
                                               std::numeric_limits<std::int64_t>::min(),
                                               std::numeric_limits<std::uint64_t>::max(), 0.1}},
                               {"data", PropertyList::Data{"\0\xFF"s}},
                               {"date", PropertyList::Date{981173106}},
                               {"long", std::string(20, 'x')},
                               {"no", false},
                               {"same", "plain"},
                               {"text", "plain"},
                               {"unicode", "\xE2\x82\xAC\xF0\x9F\x98\x80"},
                               {"yes", true},
                           }));
    for (std::size_t length = 0; length < bytes.size(); ++length) {
        // A copy of its own, so that the address sanitizer sees a read beyond its end.
        const std::string truncated = bytes.substr(0, length);
        EXPECT_NE(errorOf(truncated), "");
    }
}

TEST(BinaryPropertyListReader, ReadsBooleans) {
    EXPECT_EQ(readObject("\x08"), PropertyList(false));
    EXPECT_EQ(readObject("\x09"), PropertyList(true));
}

TEST(BinaryPropertyListReader, ReadsIntegersOfEverySize) {
    EXPECT_EQ(readObject("\x10\xFF"), PropertyList(255));
    EXPECT_EQ(readObject("\x11\xFF\xFE"), PropertyList(65534));
    EXPECT_EQ(readObject("\x12\xFF\xFF\xFF\xFE"), PropertyList(4294967294));
    EXPECT_EQ(readObject("\x13\x7F\xFF\xFF\xFF\xFF\xFF\xFF\xFF"),
              PropertyList(std::numeric_limits<std::int64_t>::max()));
    EXPECT_EQ(readObject("\x13" + std::string(8, '\xFF')), PropertyList(-1));
    EXPECT_EQ(readObject("\x14" + std::string(8, '\0') + std::string(8, '\xFF')),
              PropertyList(std::numeric_limits<std::uint64_t>::max()));
    EXPECT_EQ(readObject("\x14" + std::string(16, '\xFF')), PropertyList(-1));
}

TEST(BinaryPropertyListReader, RefusesIntegersBeyond64Bits) {
    EXPECT_EQ(errorOfObject("\x14" + std::string(7, '\0') + "\x01" + std::string(8, '\0')),
              "byte 8: the integer does not fit 64 bits");
    EXPECT_EQ(errorOfObject("\x14" + std::string(8, '\xFF') + std::string(8, '\x7F')),
              "byte 8: the integer does not fit 64 bits");
    EXPECT_EQ(errorOfObject("\x15" + std::string(32, '\0')), "byte 8: malformed integer");
}

TEST(BinaryPropertyListReader, ReadsRealsOfBothSizes) {
    EXPECT_EQ(readObject("\x22" + bigEndian(std::bit_cast<std::uint32_t>(-1.5F), 4)), PropertyList(-1.5));
    EXPECT_EQ(readObject("\x23" + bigEndian(std::bit_cast<std::uint64_t>(0.1), 8)), PropertyList(0.1));
    EXPECT_EQ(errorOfObject("\x21\x01\x01"), "byte 8: malformed real");
}

TEST(BinaryPropertyListReader, DatesCountFrom2001) {
    EXPECT_EQ(readObject("\x33" + std::string(8, '\0')), PropertyList(PropertyList::Date{978307200}));
    EXPECT_EQ(readObject("\x33" + bigEndian(std::bit_cast<std::uint64_t>(-0.5), 8)),
              PropertyList(PropertyList::Date{978307199.5}));
    EXPECT_EQ(errorOfObject("\x33\x7F\xF0" + std::string(6, '\0')), "byte 8: the date is not finite");
    EXPECT_EQ(errorOfObject("\x32" + std::string(8, '\0')), "byte 8: malformed date");
}

TEST(BinaryPropertyListReader, ReadsDataAndCountsThatStandApart) {
    EXPECT_EQ(readObject("\x40"), PropertyList(PropertyList::Data()));
    EXPECT_EQ(readObject("\x43"
                         "a\0b"s),
              PropertyList(PropertyList::Data{"a\0b"s}));
    EXPECT_EQ(readObject("\x4F\x10\x02"
                         "ab"),
              PropertyList(PropertyList::Data{"ab"}));
    EXPECT_EQ(readObject("\x4F\x13" + bigEndian(300, 8) + std::string(300, 'x')),
              PropertyList(PropertyList::Data{std::string(300, 'x')}));
}

TEST(BinaryPropertyListReader, RefusesMalformedCounts) {
    EXPECT_EQ(errorOfObject("\x4F\x14" + std::string(16, '\0')), "byte 9: malformed count");
    EXPECT_EQ(errorOfObject("\x4F\x22" + std::string(16, '\0')), "byte 9: malformed count");
    EXPECT_EQ(errorOfObject("\x4F"), "byte 8: the object reaches beyond the objects' end");
    EXPECT_EQ(errorOfObject("\x4F\x11\x01"), "byte 8: the object reaches beyond the objects' end");
}

TEST(BinaryPropertyListReader, ReadsStrings) {
    EXPECT_EQ(readObject("\x50"), PropertyList(""));
    EXPECT_EQ(readObject("\x53"
                         "a\x7F\n"),
              PropertyList("a\x7F\n"));
    EXPECT_EQ(readObject("\x64\0A\x20\xAC\xD8\x3D\xDE\0"s), PropertyList("A\xE2\x82\xAC\xF0\x9F\x98\x80"));
}

TEST(BinaryPropertyListReader, RefusesASCIIStringsWithOtherBytes) {
    EXPECT_EQ(errorOfObject("\x52"
                            "a\x80"),
              "byte 10: an ASCII string holds other bytes");
}

TEST(BinaryPropertyListReader, RefusesHalfSurrogatePairs) {
    EXPECT_EQ(errorOfObject("\x62\0A\xD8\x3D"s), "byte 11: half a surrogate pair");
    EXPECT_EQ(errorOfObject("\x62\xD8\x3D\0A"s), "byte 9: half a surrogate pair");
    EXPECT_EQ(errorOfObject("\x61\xDE\0"s), "byte 9: half a surrogate pair");
}

TEST(BinaryPropertyListReader, RefusesKindsThatAreNoPropertyListValues) {
    EXPECT_EQ(errorOfObject("\0"s), "byte 8: null is no property-list value");
    EXPECT_EQ(errorOfObject("\x0F"), "byte 8: unknown kind of object");
    EXPECT_EQ(errorOfObject("\x80\x01"), "byte 8: a UID is no property-list value");
    EXPECT_EQ(errorOfObject("\xC0"), "byte 8: unknown kind of object");
    EXPECT_EQ(errorOfObject("\x70"), "byte 8: unknown kind of object");
}

TEST(BinaryPropertyListReader, ReadsContainers) {
    Document document;
    document.objects = {document.dictionary({1, 2, 3, 4}),
                        "\x51k",
                        "\x51"
                        "a",
                        document.array({1, 5, 1}),
                        "\x09",
                        document.array({})};
    EXPECT_EQ(read(document.bytes()), PropertyList(Dictionary{{"a", true}, {"k", Array{"k", Array(), "k"}}}));
}

TEST(BinaryPropertyListReader, ReadsOffsetsAndReferencesOfEverySize) {
    for (std::size_t size = 1; size <= 8; ++size) {
        Document document;
        document.offsetSize = size;
        document.referenceSize = size;
        document.topObject = 1;
        document.objects = {"\x09", document.array({0})};
        EXPECT_EQ(read(document.bytes()), PropertyList(Array{true})) << size;
    }
}

TEST(BinaryPropertyListReader, TheLastOfEqualKeysCounts) {
    Document document;
    document.objects = {document.dictionary({1, 1, 2, 3}), "\x51k", "\x08", "\x09"};
    EXPECT_EQ(read(document.bytes()), PropertyList(Dictionary{{"k", true}}));
}

TEST(BinaryPropertyListReader, RefusesKeysThatAreNoStrings) {
    Document document;
    document.objects = {document.dictionary({1, 1}), "\x09"};
    EXPECT_EQ(errorOf(document.bytes()), "byte 9: a key is no string");
}

TEST(BinaryPropertyListReader, ObjectsMayBeShared) {
    Document document;
    document.objects = {document.array({1, 1, 2}), document.array({2}), "\x09"};
    EXPECT_EQ(read(document.bytes()), PropertyList(Array{Array{true}, Array{true}, true}));
}

} // namespace
} // namespace welcomer
