#include "backends/network/IPv4Text.h"

#include <gtest/gtest.h>

namespace welcomer::network {
namespace {

TEST(IPv4TextTest, OnlyFourDecimalNumbersAreAnAddress) {
    EXPECT_EQ(parseIPv4("192.0.2.7"), 0xC0000207U);
    for (const char* text :
         {"", "1.2.3", "1.2.3.4.5", "256.1.1.1", "1.2.3.4 ", " 1.2.3.4", "0x1.2.3.4", "a.b.c.d"}) {
        EXPECT_EQ(parseIPv4(text), std::nullopt) << text;
    }
    EXPECT_EQ(parseIPv4(std::string("1.2.3.4\0x", 9)), std::nullopt);
    EXPECT_EQ(formatIPv4(0xC0000207U), "192.0.2.7");
}

TEST(IPv4TextTest, AMaskIsOnesBeforeZeros) {
    for (int length = 0; length <= 32; ++length) {
        EXPECT_EQ(prefixLengthOf(maskOf(length)), length);
    }
    EXPECT_EQ(formatIPv4(maskOf(23)), "255.255.254.0");
    EXPECT_EQ(prefixLengthOf(*parseIPv4("255.0.255.0")), std::nullopt);
    EXPECT_EQ(prefixLengthOf(*parseIPv4("0.0.0.1")), std::nullopt);
}

} // namespace
} // namespace welcomer::network
