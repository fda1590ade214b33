#include "propertylist/RealText.h"

#include <bit>
#include <cstdint>
#include <gtest/gtest.h>
#include <limits>
#include <random>

namespace welcomer {
namespace {

using Limits = std::numeric_limits<double>;

// The bits that come back; all ones, the bits of a not-a-number of its own, when nothing does.
std::uint64_t readBack(std::uint64_t bits) {
    const auto value = parseReal(formatReal(std::bit_cast<double>(bits)));
    return value ? std::bit_cast<std::uint64_t>(*value) : ~bits;
}

std::uint64_t readBack(double value) {
    return readBack(std::bit_cast<std::uint64_t>(value));
}

TEST(RealText, IsTheShortestDecimalForm) {
    EXPECT_EQ(formatReal(0.1), "0.1");
    EXPECT_EQ(formatReal(2), "2");
    EXPECT_EQ(formatReal(-0.0), "-0");
    EXPECT_EQ(formatReal(1e300), "1e+300");
    EXPECT_EQ(formatReal(Limits::infinity()), "inf");
    EXPECT_EQ(formatReal(-Limits::infinity()), "-inf");
    EXPECT_EQ(formatReal(Limits::quiet_NaN()), "nan");
}

TEST(RealText, ExtremesReadBackToTheSameBits) {
    for (const double value : {0.0, -0.0, 0.1, 1.0 / 3, Limits::max(), Limits::lowest(), Limits::min(),
                               Limits::denorm_min(), -Limits::denorm_min(), Limits::epsilon(),
                               Limits::infinity(), -Limits::infinity(), 9007199254740993.0}) {
        EXPECT_EQ(readBack(value), std::bit_cast<std::uint64_t>(value)) << value;
    }
}

TEST(RealText, AnyBitsReadBackToTheSameBits) {
    std::mt19937_64 random(20010203);
    for (int round = 0; round < 100000; ++round) {
        const std::uint64_t bits = random();
        ASSERT_EQ(readBack(bits), bits);
    }
}

TEST(RealText, EveryNotANumberKeepsItsBits) {
    constexpr std::uint64_t sign = std::uint64_t{1} << 63;
    for (const std::uint64_t bits : {0x7ff8000000000000U, 0x7ff8000000000001U, 0x7ff0000000000001U}) {
        EXPECT_EQ(readBack(bits), bits);
        EXPECT_EQ(readBack(bits | sign), bits | sign);
    }
    EXPECT_EQ(formatReal(std::bit_cast<double>(0xfff8000000000000)), "nan(0xfff8000000000000)");
}

TEST(RealText, ReadsTheFormsOfOthers) {
    EXPECT_EQ(parseReal("+1.5"), 1.5);
    EXPECT_EQ(parseReal(".5"), 0.5);
    EXPECT_EQ(parseReal("1."), 1.0);
    EXPECT_EQ(parseReal("1E3"), 1000.0);
    EXPECT_EQ(parseReal("+Infinity"), Limits::infinity());
    EXPECT_EQ(parseReal("-INFINITY"), -Limits::infinity());
    EXPECT_TRUE(parseReal("NaN"));
    EXPECT_TRUE(parseReal("-nan"));
}

TEST(RealText, RefusesWhatIsNoNumber) {
    for (const char* text :
         {"", "+", "-", ".", "one", "1x", "1 ", " 1", "--1", "+-1", "0x10", "1e", "1,5", "infinit",
          "nan(0x1)", "nan(0x7ff8000000000001", "nan(0x7ff8000000000001)x", "nan()", "nan(ind)"}) {
        EXPECT_EQ(parseReal(text), std::nullopt) << text;
    }
}

TEST(RealText, RefusesWhatIsBeyondTheRange) {
    EXPECT_EQ(parseReal("1e309"), std::nullopt);
    EXPECT_EQ(parseReal("-1e309"), std::nullopt);
    EXPECT_EQ(parseReal("1e-400"), std::nullopt);
}

} // namespace
} // namespace welcomer
