#include "plugins/PluginText.h"

#include <gtest/gtest.h>

#include <string>

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

TEST(PluginText, EndsNoLineAndSteersNoTerminal) {
    EXPECT_EQ(pluginText("done\n<115>forged\x1b[2J"), "done\\n<115>forged\\x1b[2J");
}

TEST(PluginText, IsCutAfterOneKibibyteWithAnEllipsisOnACharactersEnd) {
    const std::string longest(1024, 'x');
    EXPECT_EQ(pluginText(longest), longest);
    EXPECT_EQ(pluginText(longest + "x"), std::string(1021, 'x') + "…");
    std::string birds;
    for (int i = 0; i < 50000; ++i) {
        birds += "\xF0\x9F\x90\xA6";
    }
    EXPECT_EQ(pluginText(birds), birds.substr(0, 1020) + "…");
    EXPECT_EQ(pluginText(std::string(100000, '\xFF')).size(), 1023U); // each became three bytes
}

} // namespace
} // namespace welcomer
