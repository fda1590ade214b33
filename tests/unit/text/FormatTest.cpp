#include "text/Format.h"

#include <cstdint>
#include <gtest/gtest.h>

namespace elsewhere {

struct Thing {};

std::string describe(const Thing&) {
    return "<Thing>";
}

} // namespace elsewhere

namespace welcomer::text {
namespace {

TEST(Format, ATextWithoutPlaceholdersStandsAsItIs) {
    EXPECT_EQ(format("Self destructing..."), "Self destructing...");
    EXPECT_EQ(format(""), "");
}

TEST(Format, EveryPlaceholderIsReplaced) {
    EXPECT_EQ(format("%@ %d %ld %lu %s", "a", -1, -2L, 3UL, "b"), "a -1 -2 3 b");
    EXPECT_EQ(format("%0.2f|%0.3f", 2.5, 0.0625), "2.50|0.062");
    EXPECT_EQ(format("100%%"), "100%");
}

TEST(Format, APlaceholderMayTouchLetters) {
    EXPECT_EQ(format("Stored %lub replay data", std::size_t{12}), "Stored 12b replay data");
}

TEST(Format, AnArgumentIsNeverReadAsAFormat) {
    EXPECT_EQ(format("%@ and %@", "%@ %d %%", 1), "%@ %d %% and 1");
}

TEST(Format, AnOptionalArgumentMayBeNone) {
    EXPECT_EQ(format("for %@", std::optional<std::string>()), "for (null)");
}

TEST(Format, AnotherFoldersTypesDescribeThemselves) {
    EXPECT_EQ(format("plugin %@", elsewhere::Thing{}), "plugin <Thing>");
}

TEST(Format, ThePlaceholdersTakeTheirOwnKindsOnly) {
    EXPECT_TRUE(accepts<int>(Placeholder::Int));
    EXPECT_FALSE(accepts<long>(Placeholder::Int));
    EXPECT_FALSE(accepts<int>(Placeholder::Long));
    EXPECT_FALSE(accepts<long>(Placeholder::UnsignedLong));
    EXPECT_FALSE(accepts<std::string>(Placeholder::CString));
    EXPECT_FALSE(accepts<int>(Placeholder::ThreeDecimals));
    EXPECT_FALSE(accepts<int*>(Placeholder::Object));
}

TEST(Format, TheLargestRealFits) {
    EXPECT_EQ(format("%0.3f", 1.7976931348623157e308).size(), 313U);
}

} // namespace
} // namespace welcomer::text
