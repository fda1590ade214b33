#include "tools/account-server/LogLine.h"

#include <gtest/gtest.h>

namespace welcomer::server {
namespace {

TEST(LogLine, PlainValuesStandAsTheyAreAndOthersInQuotes) {
    EXPECT_EQ(LogLine("event").add("a", "anna@x.example").add("b", "two words").add("c", "").text(),
              "event a=anna@x.example b=\"two words\" c=\"\"");
}

TEST(LogLine, NoValueCanLookLikeAnotherOneOrEndTheLine) {
    EXPECT_EQ(LogLine("event").add("user", "x\" status=\"200").text(), "event user=\"x\\\" status=\\\"200\"");
    EXPECT_EQ(LogLine("event").add("user", "x\\\" y").text(), "event user=\"x\\\\\\\" y\"");
    const std::string text = LogLine("event").add("user", "x\nevent user=y\x1b[0m").text();
    EXPECT_EQ(text.find('\n'), std::string::npos);
    EXPECT_EQ(text.find('\x1b'), std::string::npos);
}

TEST(LogLine, ALongValueIsCut) {
    EXPECT_LT(LogLine("event").add("user", std::string(100'000, 'x')).text().size(), 300U);
}

} // namespace
} // namespace welcomer::server
