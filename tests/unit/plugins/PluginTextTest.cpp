#include "plugins/PluginText.h"

#include <gtest/gtest.h>

namespace welcomer {
namespace {

TEST(PluginText, KeepsUtf8AsItStands) {
    EXPECT_EQ(pluginText(""), "");
    EXPECT_EQ(pluginText("plain \xC3\xA9 \xF0\x9F\x90\xA6"), "plain \xC3\xA9 \xF0\x9F\x90\xA6");
}

TEST(PluginText, ReplacesEveryByteThatBelongsToNoCharacter) {
    EXPECT_EQ(pluginText("a\xFF\xFE"
                         "b\xC3"),
              "a\xEF\xBF\xBD\xEF\xBF\xBD"
              "b\xEF\xBF\xBD");
}

} // namespace
} // namespace welcomer
