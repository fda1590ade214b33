#include "tools/welcomer/cli/Suggestion.h"

#include <gtest/gtest.h>

namespace welcomer::tool {

const std::vector<std::string> kNames = {"show", "store", "delete", "services", "state", "--json", ""};

TEST(SuggestionTest, OneCharacterLeftOutPutInReplacedOrSwappedIsNear) {
    for (const char* const typed : {"shw", "shoow", "shot", "hsow"}) {
        EXPECT_EQ(didYouMean(typed, kNames), "; did you mean \"show\"?") << typed;
    }
    EXPECT_EQ(didYouMean("--jsno", kNames), "; did you mean \"--json\"?");
}

TEST(SuggestionTest, ALongerNameMayHaveMoreMistakes) {
    EXPECT_EQ(didYouMean("servcies", kNames), "; did you mean \"services\"?");
    EXPECT_EQ(didYouMean("srevcies", kNames), "; did you mean \"services\"?");
    EXPECT_EQ(didYouMean("sxrxxcxs", kNames), "");
}

TEST(SuggestionTest, TheBeginningOfANameIsNear) {
    EXPECT_EQ(didYouMean("ser", kNames), "; did you mean \"services\"?");
    EXPECT_EQ(didYouMean("se", kNames), "");
}

TEST(SuggestionTest, WhatIsNearNothingIsNotAskedBack) {
    for (const std::string& typed :
         {std::string("nonsense"), std::string(""), std::string("x"), std::string(65, 's')}) {
        EXPECT_EQ(didYouMean(typed, kNames), "") << typed;
    }
    EXPECT_EQ(didYouMean("show", {}), "");
}

} // namespace welcomer::tool
