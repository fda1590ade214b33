#include "propertylist/PropertyListReadings.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <limits>
#include <utility>

namespace welcomer {
namespace {

constexpr std::int64_t kLowest = std::numeric_limits<std::int64_t>::min();
constexpr std::int64_t kHighest = std::numeric_limits<std::int64_t>::max();

TEST(BooleanReading, NoValueIsFalse) {
    EXPECT_FALSE(booleanReading(std::nullopt));
}

TEST(BooleanReading, ABooleanReadsAsItself) {
    EXPECT_TRUE(booleanReading(PropertyList(true)));
    EXPECT_FALSE(booleanReading(PropertyList(false)));
}

TEST(BooleanReading, ANumberReadsAsWhetherItDiffersFromZero) {
    for (const PropertyList& value : {PropertyList(1), PropertyList(-7), PropertyList(0.25),
                                      PropertyList(std::numeric_limits<std::uint64_t>::max())}) {
        EXPECT_TRUE(booleanReading(value));
    }
    for (const PropertyList& value : {PropertyList(0), PropertyList(0.0), PropertyList(-0.0),
                                      PropertyList(std::numeric_limits<double>::quiet_NaN())}) {
        EXPECT_FALSE(booleanReading(value));
    }
}

TEST(BooleanReading, AStringReadsAsYesTrueOrANumber) {
    for (const char* text : {"YES", "yes", "Yes", "TRUE", "true", "1", "-2", "0.5"}) {
        EXPECT_TRUE(booleanReading(PropertyList(text))) << text;
    }
    for (const char* text :
         {"", "NO", "false", "0", "0.0", "y", "yes please", "truely", "inf", "nan", "1x"}) {
        EXPECT_FALSE(booleanReading(PropertyList(text))) << text;
    }
}

TEST(BooleanReading, AnythingElseIsFalse) {
    EXPECT_FALSE(booleanReading(PropertyList(PropertyList::Dictionary{{"a", true}})));
    EXPECT_FALSE(booleanReading(PropertyList(PropertyList::Array{true})));
    EXPECT_FALSE(booleanReading(PropertyList(PropertyList::Data{"1"})));
    EXPECT_FALSE(booleanReading(PropertyList(PropertyList::Date{1})));
}

TEST(IntegerReading, NoValueIsZero) {
    EXPECT_EQ(integerReading(std::nullopt), 0);
}

TEST(IntegerReading, AnIntegerReadsAsItself) {
    EXPECT_EQ(integerReading(PropertyList(kLowest)), kLowest);
    EXPECT_EQ(integerReading(PropertyList(kHighest)), kHighest);
}

TEST(IntegerReading, ARealIsTruncatedTowardsZero) {
    EXPECT_EQ(integerReading(PropertyList(2.9)), 2);
    EXPECT_EQ(integerReading(PropertyList(-2.9)), -2);
    EXPECT_EQ(integerReading(PropertyList(std::numeric_limits<double>::quiet_NaN())), 0);
}

TEST(IntegerReading, ANumericStringCounts) {
    EXPECT_EQ(integerReading(PropertyList("5")), 5);
    EXPECT_EQ(integerReading(PropertyList("-12")), -12);
    EXPECT_EQ(integerReading(PropertyList("4.7")), 4);
    for (const char* text : {"", "five", "5 seconds", "0x10", "inf"}) {
        EXPECT_EQ(integerReading(PropertyList(text)), 0) << text;
    }
}

TEST(IntegerReading, WhatLiesBeyondSixtyFourBitsIsTheNearestEnd) {
    EXPECT_EQ(integerReading(PropertyList(std::numeric_limits<std::uint64_t>::max())), kHighest);
    EXPECT_EQ(integerReading(PropertyList(9223372036854775808.0)), kHighest);
    EXPECT_EQ(integerReading(PropertyList(-1e300)), kLowest);
    EXPECT_EQ(integerReading(PropertyList("99999999999999999999")), kHighest);
}

TEST(IntegerReading, ABooleanIsOneOrZero) {
    EXPECT_EQ(integerReading(PropertyList(true)), 1);
    EXPECT_EQ(integerReading(PropertyList(false)), 0);
}

TEST(IntegerReading, AnythingElseIsZero) {
    EXPECT_EQ(integerReading(PropertyList(PropertyList::Array{7})), 0);
    EXPECT_EQ(integerReading(PropertyList(PropertyList::Data{"7"})), 0);
}

TEST(IntegerIn, ANumberReadsAsItDoesElsewhere) {
    for (const auto& [value, number] :
         {std::pair(PropertyList(7), 7), std::pair(PropertyList(-2.9), -2), std::pair(PropertyList("3"), 3),
          std::pair(PropertyList("0"), 0), std::pair(PropertyList(true), 1),
          std::pair(PropertyList(false), 0)}) {
        EXPECT_EQ(integerIn(value), number);
    }
    EXPECT_EQ(integerIn(PropertyList(std::numeric_limits<std::uint64_t>::max())), kHighest);
}

TEST(IntegerIn, WhatIsNoNumberIsNone) {
    for (const PropertyList& value :
         {PropertyList(""), PropertyList("fine"), PropertyList("0 "), PropertyList("nan"),
          PropertyList(PropertyList::Dictionary{{"code", 0}}), PropertyList(PropertyList::Array{0}),
          PropertyList(PropertyList::Data{"0"}), PropertyList(PropertyList::Date{0}),
          PropertyList(std::numeric_limits<double>::quiet_NaN())}) {
        EXPECT_EQ(integerIn(value), std::nullopt);
    }
}

} // namespace
} // namespace welcomer
