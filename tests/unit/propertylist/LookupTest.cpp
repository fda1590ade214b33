#include "propertylist/Lookup.h"

#include <gtest/gtest.h>

namespace welcomer {

namespace {

using Dictionary = PropertyList::Dictionary;
using Array = PropertyList::Array;
using Texts = std::optional<std::vector<std::string>>;

Dictionary everyKind() {
    return {{"text", "a"},
            {"array", Array{"a", 1, "b"}},
            {"dictionary", Dictionary{{"inner", "b"}}},
            {"yes", true},
            {"no", false},
            {"number", 1}};
}

} // namespace

TEST(LookupTest, FindsWhatStandsUnderAKeyInEveryKindOfPlace) {
    const Dictionary place = everyKind();
    const PropertyList value = place;
    const PropertyList* const none = nullptr;
    EXPECT_EQ(valueIn(place, "text"), &place.at("text"));
    EXPECT_EQ(valueIn(&place, "text"), &place.at("text"));
    EXPECT_EQ(valueIn(value, "text"), value.find("text"));
    EXPECT_EQ(valueIn(&value, "text"), value.find("text"));
    EXPECT_EQ(valueIn(place, "other"), nullptr);
    EXPECT_EQ(valueIn(PropertyList("text"), "text"), nullptr);
    EXPECT_EQ(valueIn(none, "text"), nullptr);
}

TEST(LookupTest, GivesATextAnArrayOrADictionaryOnlyWhereItIsOne) {
    const Dictionary place = everyKind();
    EXPECT_EQ(*textIn(place, "text"), "a");
    EXPECT_EQ(textIn(place, "array"), nullptr);
    EXPECT_EQ(textIn(place, "other"), nullptr);
    EXPECT_EQ(arrayIn(place, "array")->size(), 3U);
    EXPECT_EQ(arrayIn(place, "text"), nullptr);
    EXPECT_EQ(*textIn(dictionaryIn(place, "dictionary"), "inner"), "b");
    EXPECT_EQ(*textIn(valueIn(place, "dictionary"), "inner"), "b");
    EXPECT_EQ(dictionaryIn(place, "text"), nullptr);
    EXPECT_EQ(textIn(dictionaryIn(place, "other"), "inner"), nullptr);
}

TEST(LookupTest, WhatIsFoundInAPlaceThatMayChangeMayBeChanged) {
    Dictionary place = everyKind();
    *textIn(place, "text") = "changed";
    (*dictionaryIn(place, "dictionary"))["inner"] = "changed";
    EXPECT_EQ(place["text"], "changed");
    EXPECT_EQ(place["dictionary"], (Dictionary{{"inner", "changed"}}));
}

TEST(LookupTest, TheTextsOfAnArrayLeaveOutWhatIsNone) {
    const Dictionary place = everyKind();
    EXPECT_EQ(textsIn(place, "array"), (Texts({"a", "b"})));
    EXPECT_EQ(textsIn(Dictionary{{"array", Array{}}}, "array"), Texts(std::in_place));
    EXPECT_EQ(textsIn(place, "text"), std::nullopt);
    EXPECT_EQ(textsIn(place, "other"), std::nullopt);
}

TEST(LookupTest, OnlyTheBooleanTrueIsTrue) {
    const Dictionary place = everyKind();
    EXPECT_TRUE(isTrueIn(place, "yes"));
    EXPECT_FALSE(isTrueIn(place, "no"));
    EXPECT_FALSE(isTrueIn(place, "number"));
    EXPECT_FALSE(isTrueIn(place, "other"));
}

TEST(LookupTest, ACopyIsAValueOfItsOwnOrNone) {
    const Dictionary place = everyKind();
    EXPECT_EQ(copyOf(textIn(place, "text")), std::optional<std::string>("a"));
    EXPECT_EQ(copyOf(textIn(place, "other")), std::nullopt);
}

} // namespace welcomer
