#include "propertylist/BinaryPropertyListReader.h"

#include <bit>
#include <cstdint>
#include <gtest/gtest.h>
#include <limits>
#include <vector>

namespace welcomer {
namespace {

using namespace std::string_literals;
using Array = PropertyList::Array;
using Dictionary = PropertyList::Dictionary;

std::string bigEndian(std::uint64_t value, std::size_t size) {
    std::string bytes(size, '\0');
    for (auto byte = bytes.rbegin(); byte != bytes.rend(); ++byte, value >>= 8) {
        *byte = static_cast<char>(value);
    }
    return bytes;
}

// A document made object by object. The first object begins at byte 8.
struct Document {
    std::vector<std::string> objects;
    std::size_t offsetSize = 4;
    std::size_t referenceSize = 2;
    std::uint64_t topObject = 0;

    // A container with the references of its content; `kind` is 0xA0 or 0xD0.
    std::string container(int kind, std::size_t count, const std::vector<std::uint64_t>& references) const {
        std::string object =
            count < 15 ? std::string(1, static_cast<char>(kind | static_cast<int>(count)))
                       : std::string(1, static_cast<char>(kind | 15)) + "\x12" + bigEndian(count, 4);
        for (const std::uint64_t reference : references) {
            object += bigEndian(reference, referenceSize);
        }
        return object;
    }

    std::string array(const std::vector<std::uint64_t>& references) const {
        return container(0xA0, references.size(), references);
    }

    std::string dictionary(const std::vector<std::uint64_t>& references) const {
        return container(0xD0, references.size() / 2, references);
    }

    std::string bytes() const {
        std::string result = "bplist00";
        std::string table;
        for (const std::string& object : objects) {
            table += bigEndian(result.size(), offsetSize);
            result += object;
        }
        const std::size_t tableOffset = result.size();
        return result + table + std::string(6, '\0') + bigEndian(offsetSize, 1) +
               bigEndian(referenceSize, 1) + bigEndian(objects.size(), 8) + bigEndian(topObject, 8) +
               bigEndian(tableOffset, 8);
    }
};

PropertyList read(std::string_view bytes) {
    PropertyListReadResult result = readBinaryPropertyList(bytes);
    EXPECT_EQ(result.error, "");
    return result.value.value_or("nothing read");
}

std::string errorOf(std::string_view bytes) {
    const PropertyListReadResult result = readBinaryPropertyList(bytes);
    EXPECT_FALSE(result);
    EXPECT_EQ(result.error.find('\n'), std::string::npos);
    return result.error;
}

std::string documentOf(const std::string& object) {
    Document document;
    document.objects = {object};
    return document.bytes();
}

PropertyList readObject(const std::string& object) {
    return read(documentOf(object));
}

std::string errorOfObject(const std::string& object) {
    return errorOf(documentOf(object));
}

std::string fromHexadecimal(std::string_view digits) {
    std::string bytes;
    for (; !digits.empty(); digits.remove_prefix(2)) {
        bytes += static_cast<char>(std::stoi(std::string(digits.substr(0, 2)), nullptr, 16));
    }
    return bytes;
}

// ---- Values

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

// ---- Frame

TEST(BinaryPropertyListReader, RefusesOtherVersions) {
    std::string bytes = documentOf("\x09");
    bytes[7] = '1';
    EXPECT_EQ(errorOf(bytes), "byte 0: not version 00 of the binary format");
}

TEST(BinaryPropertyListReader, RefusesDataThatIsTooShort) {
    EXPECT_EQ(errorOf("bplist00"), "byte 8: the data is too short for a binary property list");
    EXPECT_EQ(errorOf("bplist00" + std::string(31, '\x01')),
              "byte 39: the data is too short for a binary property list");
}

TEST(BinaryPropertyListReader, RefusesAMalformedTrailer) {
    // One object of one byte and its offset of four: the trailer begins at byte 13.
    const std::string good = documentOf("\x09");
    const auto errorWith = [&good](std::size_t offset, const std::string& bytes) {
        return errorOf(std::string(good).replace(offset, bytes.size(), bytes));
    };
    EXPECT_EQ(errorWith(19, "\0"s), "byte 19: offsets of 0 bytes");
    EXPECT_EQ(errorWith(19, "\x09"), "byte 19: offsets of 9 bytes");
    EXPECT_EQ(errorWith(20, "\0"s), "byte 20: references of 0 bytes");
    EXPECT_EQ(errorWith(20, "\x09"), "byte 20: references of 9 bytes");
    EXPECT_EQ(errorWith(21, bigEndian(2, 8)),
              "byte 21: the offset table does not end where the trailer begins");
    EXPECT_EQ(errorWith(21, bigEndian(0x4000000000000001, 8)),
              "byte 21: the offset table does not end where the trailer begins");
    EXPECT_EQ(errorWith(29, bigEndian(1, 8)), "byte 29: there is no object 1");
    EXPECT_EQ(errorWith(37, bigEndian(7, 8)), "byte 37: the offset table lies outside the data");
    EXPECT_EQ(errorWith(37, bigEndian(14, 8)), "byte 37: the offset table lies outside the data");
    EXPECT_EQ(errorWith(37, std::string(8, '\xFF')), "byte 37: the offset table lies outside the data");
    EXPECT_EQ(errorWith(9, bigEndian(7, 4)), "byte 9: object 0 lies outside the data");
    EXPECT_EQ(errorWith(9, bigEndian(9, 4)), "byte 9: object 0 lies outside the data");
}

TEST(BinaryPropertyListReader, NothingMayFollowTheTopLevelValue) {
    std::string bytes = documentOf("\x09");
    bytes.insert(13, "\0\0\0\x08"s);
    EXPECT_EQ(errorOf(bytes), "byte 25: the offset table does not end where the trailer begins");
    EXPECT_NE(errorOf(documentOf("\x09") + "x"), "");
}

TEST(BinaryPropertyListReader, RefusesObjectsThatReachBeyondTheirEnd) {
    for (const std::string& object :
         {"\x13\x01"s, "\x11\x01"s, "\x22\0\0\0"s, "\x23\0\0\0\0\0\0\0"s, "\x33\0\0\0\0\0\0\0"s,
          "\x42"
          "a"s,
          "\x52"
          "a"s,
          "\x61"
          "a"s,
          "\xA1\0"s, "\xD1\0\0\0"s, "\x4F\x13\xFF\xFF\xFF\xFF\xFF\xFF\xFF\xFF"s,
          "\x6F\x13\x80\0\0\0\0\0\0\0"s, "\xAF\x13\xFF\xFF\xFF\xFF\xFF\xFF\xFF\xFF"s,
          "\xDF\x13\x40\0\0\0\0\0\0\0"s}) {
        EXPECT_EQ(errorOfObject(object), "byte 8: the object reaches beyond the objects' end");
    }
}

TEST(BinaryPropertyListReader, RefusesReferencesToNothing) {
    Document document;
    document.objects = {document.array({0x0102})};
    EXPECT_EQ(errorOf(document.bytes()), "byte 9: there is no object 258");
    document.objects = {document.dictionary({1, 2}), "\x51k"};
    EXPECT_EQ(errorOf(document.bytes()), "byte 11: there is no object 2");
}

// ---- Bounds

TEST(BinaryPropertyListReader, RefusesObjectsThatContainThemselves) {
    Document document;
    document.objects = {document.array({0})};
    EXPECT_EQ(errorOf(document.bytes()), "byte 9: an object contains itself");
    document.objects = {document.array({1}), document.dictionary({2, 0}), "\x51k"};
    EXPECT_EQ(errorOf(document.bytes()), "byte 14: an object contains itself");
}

std::string chain(std::size_t depth) {
    Document document;
    document.referenceSize = 4;
    for (std::size_t level = 1; level < depth; ++level) {
        document.objects.push_back(document.array({level}));
    }
    document.objects.push_back(document.array({}));
    return document.bytes();
}

TEST(BinaryPropertyListReader, ReadsTheGreatestDepthAndRefusesMore) {
    EXPECT_TRUE(readBinaryPropertyList(chain(kPropertyListMaximumDepth)));
    EXPECT_EQ(errorOf(chain(kPropertyListMaximumDepth + 1)), "byte 2608: nested more than 520 deep");
}

TEST(BinaryPropertyListReader, RefusesAHundredThousandLevels) {
    EXPECT_EQ(errorOf(chain(100000)), "byte 2608: nested more than 520 deep");
}

TEST(BinaryPropertyListReader, DepthIsNesting) {
    Document document;
    document.objects = {document.array(std::vector<std::uint64_t>(2000, 1)), document.array({})};
    EXPECT_EQ(read(document.bytes()).array()->size(), 2000U);
}

TEST(BinaryPropertyListReader, RefusesSharedObjectsThatMultiply) {
    // Forty levels of arrays, each naming the next one ten times.
    for (const bool isDictionary : {false, true}) {
        Document document;
        for (std::uint64_t level = 1; level < 40; ++level) {
            std::vector<std::uint64_t> references(10, level);
            if (isDictionary) {
                references.insert(references.begin(), 10, 39);
            }
            document.objects.push_back(isDictionary ? document.dictionary(references)
                                                    : document.array(references));
        }
        document.objects.push_back("\x51k");
        EXPECT_TRUE(
            errorOf(document.bytes()).ends_with("shared objects make more than the input accounts for"));
    }
}

TEST(BinaryPropertyListReader, SharedObjectsMakeAFixedNumberOfValuesBeyondTheInputSize) {
    // 1,000 times the same array of n booleans makes n * 1,000 + 1,000 values.
    const auto document = [](std::size_t count) {
        Document made;
        made.objects = {made.array(std::vector<std::uint64_t>(1000, 1)),
                        made.array(std::vector<std::uint64_t>(count, 2)), "\x09"};
        return made.bytes();
    };
    EXPECT_LT(document(66).size(), 2500U);
    EXPECT_TRUE(readBinaryPropertyList(document(66)));
    EXPECT_TRUE(errorOf(document(68)).ends_with("shared objects make more than the input accounts for"));
}

TEST(BinaryPropertyListReader, SharedTextAndDataMakeAFixedSizeBeyondTheInputSize) {
    // The same object of one MiB some times over: 16 for the input and 64 on top.
    const auto document = [](std::size_t times, const std::string& head, std::size_t size) {
        Document made;
        made.objects = {made.array(std::vector<std::uint64_t>(times, 1)), head + std::string(size, '\x20')};
        return made.bytes();
    };
    const std::string count = "\x12" + bigEndian(1 << 20, 4);
    for (const std::string& head : {"\x4F" + count, "\x5F" + count}) {
        EXPECT_TRUE(readBinaryPropertyList(document(80, head, 1 << 20)));
        EXPECT_EQ(errorOf(document(82, head, 1 << 20)),
                  "byte 178: shared objects make more than the input accounts for");
    }
    // UTF-16 counts three bytes for each unit.
    EXPECT_TRUE(readBinaryPropertyList(document(31, "\x6F" + count, 2 << 20)));
    EXPECT_EQ(errorOf(document(33, "\x6F" + count, 2 << 20)),
              "byte 80: shared objects make more than the input accounts for");
}

TEST(BinaryPropertyListReader, ReadsDataOf64MiB) {
    const std::string content(std::size_t{64} << 20, 'x');
    const PropertyList value = readObject("\x4F\x12" + bigEndian(content.size(), 4) + content);
    ASSERT_TRUE(value.data());
    EXPECT_TRUE(value.data()->bytes == content);
}

} // namespace
} // namespace welcomer
