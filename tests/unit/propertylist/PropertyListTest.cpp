#include "propertylist/PropertyList.h"

#include <gtest/gtest.h>
#include <limits>
#include <type_traits>

namespace welcomer {
namespace {

// Arrays grow without copying what is below their elements.
static_assert(std::is_nothrow_move_constructible_v<PropertyList>);

TEST(PropertyList, IsAnEmptyDictionaryToBeginWith) {
    EXPECT_EQ(PropertyList(), PropertyList(PropertyList::Dictionary()));
}

TEST(PropertyList, KeepsItsTypesApart) {
    EXPECT_EQ(PropertyList(true).type(), PropertyList::Type::Boolean);
    EXPECT_EQ(PropertyList(1).type(), PropertyList::Type::Integer);
    EXPECT_EQ(PropertyList(1.0).type(), PropertyList::Type::Real);
    EXPECT_EQ(PropertyList("1").type(), PropertyList::Type::String);
    EXPECT_EQ(PropertyList(PropertyList::Data{"1"}).type(), PropertyList::Type::Data);
    EXPECT_EQ(PropertyList(PropertyList::Date{1}).type(), PropertyList::Type::Date);
    EXPECT_EQ(PropertyList(PropertyList::Array{1}).type(), PropertyList::Type::Array);
    EXPECT_EQ(PropertyList(PropertyList::Dictionary{{"1", 1}}).type(), PropertyList::Type::Dictionary);
    EXPECT_NE(PropertyList(true), PropertyList(1));
    EXPECT_NE(PropertyList(1), PropertyList(1.0));
    EXPECT_NE(PropertyList("1"), PropertyList(PropertyList::Data{"1"}));
    EXPECT_EQ(PropertyList(true).integer(), std::nullopt);
    EXPECT_EQ(PropertyList(1).boolean(), std::nullopt);
    EXPECT_EQ(PropertyList(1).real(), std::nullopt);
    EXPECT_EQ(PropertyList(1.0).integer(), std::nullopt);
}

TEST(PropertyList, IntegersCoverBothSignedAndUnsignedRanges) {
    constexpr auto smallest = std::numeric_limits<std::int64_t>::min();
    constexpr auto largest = std::numeric_limits<std::uint64_t>::max();
    EXPECT_EQ(PropertyList(smallest).integer(), smallest);
    EXPECT_EQ(PropertyList(smallest).unsignedInteger(), std::nullopt);
    EXPECT_EQ(PropertyList(largest).unsignedInteger(), largest);
    EXPECT_EQ(PropertyList(largest).integer(), std::nullopt);
    EXPECT_EQ(PropertyList(7).unsignedInteger(), 7U);
    EXPECT_EQ(PropertyList(7), PropertyList(std::uint64_t{7}));
}

TEST(PropertyList, FindsEntriesOfDictionariesOnly) {
    const PropertyList dictionary(PropertyList::Dictionary{{"key", 1}});
    ASSERT_TRUE(dictionary.find("key"));
    EXPECT_EQ(*dictionary.find("key"), PropertyList(1));
    EXPECT_EQ(dictionary.find("other"), nullptr);
    EXPECT_EQ(PropertyList("key").find("key"), nullptr);
}

} // namespace
} // namespace welcomer
