#include "tools/launch-agents/LaunchAgent.h"

#include <gtest/gtest.h>

namespace welcomer::launch {
namespace {

std::string refusal(std::string_view definition) {
    const LaunchAgentResult result = readLaunchAgent(definition);
    EXPECT_FALSE(result.agent);
    return result.error;
}

TEST(LaunchAgent, ReadsLabelArgumentsAndRunAtLoadFromTheXMLFormat) {
    const auto result = readLaunchAgent(
        R"(<plist version="1.0"><dict><key>Label</key><string>org.example.one</string><key>ProgramArguments</key>
        <array><string>/bin/one</string><string/><string>a b</string></array><key>RunAtLoad</key><true/></dict></plist>)");
    ASSERT_TRUE(result.agent) << result.error;
    EXPECT_EQ(*result.agent, (LaunchAgent{"org.example.one", "/bin/one", {"/bin/one", "", "a b"}, true}));
    EXPECT_EQ(result.error, "");
}

TEST(LaunchAgent, IsReadFromTheOldTextFormatToo) {
    const auto result = readLaunchAgent("{ Label = one; ProgramArguments = (\"/bin/one\", two); }");
    ASSERT_TRUE(result.agent) << result.error;
    EXPECT_EQ(*result.agent, (LaunchAgent{"one", "/bin/one", {"/bin/one", "two"}, false}));
}

TEST(LaunchAgent, TheProgramGoesBeforeTheFirstArgument) {
    const auto result =
        readLaunchAgent("{ Label = one; Program = \"/bin/real\"; ProgramArguments = (name, two); }");
    ASSERT_TRUE(result.agent) << result.error;
    EXPECT_EQ(result.agent->program, "/bin/real");
    EXPECT_EQ(result.agent->arguments, (std::vector<std::string>{"name", "two"}));
}

TEST(LaunchAgent, AProgramAloneIsItsOwnOnlyArgument) {
    const auto result = readLaunchAgent("{ Label = one; Program = \"/bin/one\"; }");
    ASSERT_TRUE(result.agent) << result.error;
    EXPECT_EQ(result.agent->arguments, std::vector<std::string>{"/bin/one"});
}

TEST(LaunchAgent, RunsAtLoadOnlyWhenItSaysTrue) {
    const std::string begin = "<plist><dict><key>Label</key><string>one</string><key>Program</key>"
                              "<string>/bin/one</string>";
    const auto runs = [&](const std::string& rest) {
        const auto result = readLaunchAgent(begin + rest + "</dict></plist>");
        return result.agent && result.agent->runAtLoad;
    };
    EXPECT_TRUE(runs("<key>RunAtLoad</key><true/>"));
    EXPECT_FALSE(runs("<key>RunAtLoad</key><false/>"));
    EXPECT_FALSE(runs("<key>RunAtLoad</key><string>true</string>"));
    EXPECT_FALSE(runs(""));
}

TEST(LaunchAgent, WhatIsNoPropertyListIsRefusedWithTheReadersReason) {
    EXPECT_EQ(refusal("<plist><dict>").find("it is no property list: line 1"), 0u);
}

TEST(LaunchAgent, APropertyListThatIsNoDictionaryIsRefused) {
    EXPECT_EQ(refusal("(Label, Program)"), "it is no dictionary");
}

TEST(LaunchAgent, IsRefusedWithoutALabel) {
    EXPECT_EQ(refusal("{ Program = \"/bin/one\"; }"), "it has no label");
    EXPECT_EQ(refusal("{ Label = \"\"; Program = \"/bin/one\"; }"), "it has no label");
    EXPECT_EQ(refusal("{ Label = (one); Program = \"/bin/one\"; }"), "it has no label");
    EXPECT_EQ(refusal("{ Label = \"a\\000b\"; Program = \"/bin/one\"; }"), "it has no label");
}

TEST(LaunchAgent, IsRefusedWithoutAProgramByItsFullPath) {
    const std::string reason = "it names no program by its full path";
    EXPECT_EQ(refusal("{ Label = one; }"), reason);
    EXPECT_EQ(refusal("{ Label = one; ProgramArguments = (); }"), reason);
    EXPECT_EQ(refusal("{ Label = one; ProgramArguments = (one); }"), reason);
    EXPECT_EQ(refusal("{ Label = one; Program = one; ProgramArguments = (\"/bin/one\"); }"), reason);
    EXPECT_EQ(refusal("{ Label = one; Program = (one); ProgramArguments = (\"/bin/one\"); }"), reason);
    EXPECT_EQ(refusal("{ Label = one; Program = \"/bin/one\\000two\"; }"), reason);
}

TEST(LaunchAgent, IsRefusedWhenItsArgumentsAreNoTexts) {
    const std::string reason = "its arguments are no list of texts";
    EXPECT_EQ(refusal("{ Label = one; Program = \"/bin/one\"; ProgramArguments = two; }"), reason);
    EXPECT_EQ(refusal("{ Label = one; Program = \"/bin/one\"; ProgramArguments = (two, (three)); }"), reason);
    EXPECT_EQ(refusal("{ Label = one; Program = \"/bin/one\"; ProgramArguments = (\"a\\000b\"); }"), reason);
}

} // namespace
} // namespace welcomer::launch
