#include "tools/welcomer/cli/HelpText.h"

#include <gtest/gtest.h>

namespace welcomer::tool {

const std::string kName = "  --option TEXT";

std::string line(const std::string& name, const std::string& description) {
    return name + std::string(kHelpColumn - name.size(), ' ') + description + "\n";
}

std::string below(const std::string& description, std::size_t indent = kHelpColumn) {
    return std::string(indent, ' ') + description + "\n";
}

TEST(HelpTextTest, ADescriptionGoesOnBelowItsBeginning) {
    EXPECT_EQ(wrapHelp(line(kName, "one two three four five six seven"), 56),
              line(kName, "one two three four five") + below("six seven"));
}

TEST(HelpTextTest, WhatFitsExactlyIsNotBroken) {
    const std::string text = line(kName, std::string(30, 'x'));
    EXPECT_EQ(wrapHelp(text, 60), text);
}

TEST(HelpTextTest, OnANarrowTerminalDescriptionsHaveASmallIndent) {
    EXPECT_EQ(wrapHelp(line(kName, "one two three four five six"), 50),
              line(kName, "one two three four") + below("five six", 8));
}

TEST(HelpTextTest, OtherTextGoesOnNearTheEdge) {
    EXPECT_EQ(wrapHelp("Exit status: 0 done, 1 failed\n\nUsage:\n", 24),
              "Exit status: 0 done, 1\n  failed\n\nUsage:\n");
}

TEST(HelpTextTest, AWordThatFitsNowhereStandsAlone) {
    const std::string word(40, 'x');
    EXPECT_EQ(wrapHelp("a " + word + " b\n", 24), "a\n  " + word + "\n  b\n");
}

TEST(HelpTextTest, WithoutATerminalNothingIsBroken) {
    const std::string text = line(kName, std::string(200, 'x') + " y");
    EXPECT_EQ(wrapHelp(text, std::nullopt), text);
    EXPECT_EQ(wrapHelp(text, 19), text);
}

} // namespace welcomer::tool
