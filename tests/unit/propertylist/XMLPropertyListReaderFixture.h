// How the tests of the XML reader read.

#pragma once

#include "propertylist/XMLPropertyListReader.h"

#include <gtest/gtest.h>

namespace welcomer::xml_reading {

inline PropertyList read(std::string_view document) {
    PropertyListReadResult result = readXMLPropertyList(document);
    EXPECT_EQ(result.error, "") << document;
    return result.value.value_or("nothing read");
}

inline std::string errorOf(std::string_view document) {
    const PropertyListReadResult result = readXMLPropertyList(document);
    EXPECT_FALSE(result) << document;
    EXPECT_EQ(result.error.find('\n'), std::string::npos);
    return result.error;
}

inline std::string inPlist(std::string_view content) {
    return "<plist>" + std::string(content) + "</plist>";
}

inline PropertyList readIn(std::string_view content) {
    return read(inPlist(content));
}

// Columns count from the content: the 8 characters of the tag before it are taken off.
inline std::string errorIn(std::string_view content) {
    const std::string error = errorOf(inPlist(content));
    constexpr std::string_view prefix = "line 1, column ";
    if (!error.starts_with(prefix)) {
        return error;
    }
    std::size_t length = 0;
    const int column = std::stoi(error.substr(prefix.size()), &length);
    return std::to_string(column - 7) + error.substr(prefix.size() + length);
}

inline std::string repeated(std::string_view text, int times) {
    std::string result;
    for (int time = 0; time < times; ++time) {
        result += text;
    }
    return result;
}

} // namespace welcomer::xml_reading
