#include "tools/welcomer/terminal/Terminal.h"

#include <gtest/gtest.h>

namespace welcomer::tool {
namespace {

using Indices = std::vector<std::size_t>;

TEST(ParseChoice, ReturnAloneAndAllAreEveryItem) {
    EXPECT_EQ(parseChoice("", 3), (Indices{0, 1, 2}));
    EXPECT_EQ(parseChoice("all", 3), (Indices{0, 1, 2}));
}

TEST(ParseChoice, NoneIsNoItem) {
    EXPECT_EQ(parseChoice("none", 3), Indices{});
}

TEST(ParseChoice, NumbersComeInOrderAndOnceEach) {
    EXPECT_EQ(parseChoice("3 1,3", 3), (Indices{0, 2}));
    EXPECT_EQ(parseChoice(" 2 , ", 3), Indices{1});
}

TEST(ParseChoice, WhatMakesNoSenseIsNoChoice) {
    for (const char* answer : {"0", "4", "-1", "1x", "one", "1 none", "ALL", ",", "99999999999999999999"}) {
        EXPECT_EQ(parseChoice(answer, 3), std::nullopt) << answer;
    }
}

} // namespace
} // namespace welcomer::tool
