// The frame of a document, and bounds.

#include "propertylist/BinaryPropertyListReader.h"
#include "tests/unit/propertylist/BinaryPropertyListReaderFixture.h"

#include <cstdint>
#include <vector>

namespace welcomer {
namespace {

using namespace binary_reading;

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
