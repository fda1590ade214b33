// How the tests of the binary reader make documents and read them.

#pragma once

#include "propertylist/BinaryPropertyListReader.h"

#include <cstdint>
#include <gtest/gtest.h>
#include <vector>

namespace welcomer::binary_reading {

using namespace std::string_literals;
using Array = PropertyList::Array;
using Dictionary = PropertyList::Dictionary;

inline std::string bigEndian(std::uint64_t value, std::size_t size) {
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

inline PropertyList read(std::string_view bytes) {
    PropertyListReadResult result = readBinaryPropertyList(bytes);
    EXPECT_EQ(result.error, "");
    return result.value.value_or("nothing read");
}

inline std::string errorOf(std::string_view bytes) {
    const PropertyListReadResult result = readBinaryPropertyList(bytes);
    EXPECT_FALSE(result);
    EXPECT_EQ(result.error.find('\n'), std::string::npos);
    return result.error;
}

inline std::string documentOf(const std::string& object) {
    Document document;
    document.objects = {object};
    return document.bytes();
}

inline PropertyList readObject(const std::string& object) {
    return read(documentOf(object));
}

inline std::string errorOfObject(const std::string& object) {
    return errorOf(documentOf(object));
}

inline std::string fromHexadecimal(std::string_view digits) {
    std::string bytes;
    for (; !digits.empty(); digits.remove_prefix(2)) {
        bytes += static_cast<char>(std::stoi(std::string(digits.substr(0, 2)), nullptr, 16));
    }
    return bytes;
}

} // namespace welcomer::binary_reading
