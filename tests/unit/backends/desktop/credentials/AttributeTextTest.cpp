#include "backends/desktop/credentials/AttributeText.h"

#include <gtest/gtest.h>

namespace welcomer::desktop {

TEST(AttributeTextTest, TextStaysAsItIs) {
    for (const std::string text : {"", "Welcomer", "label \u00e9\u4e16", "a\nb\x01"}) {
        EXPECT_EQ(attributeText(text), text);
        EXPECT_EQ(bytesOfAttribute(text), text);
    }
}

TEST(AttributeTextTest, WhatIsNoTextBecomesMarkedBase64AndComesBack) {
    const std::string withNull("a\0b", 3);
    EXPECT_EQ(attributeText(withNull), "base64:YQBi");
    EXPECT_EQ(bytesOfAttribute("base64:YQBi"), withNull);
    EXPECT_EQ(bytesOfAttribute(attributeText("\xff")), "\xff");
}

TEST(AttributeTextTest, WhatBeginsWithTheMarkIsToldApart) {
    EXPECT_NE(attributeText("base64:YQBi"), "base64:YQBi");
    EXPECT_EQ(bytesOfAttribute(attributeText("base64:YQBi")), "base64:YQBi");
}

TEST(AttributeTextTest, AMarkBeforeWhatIsNoBase64IsTextOfSomebodyElse) {
    EXPECT_EQ(bytesOfAttribute("base64:!"), "base64:!");
}

} // namespace welcomer::desktop
