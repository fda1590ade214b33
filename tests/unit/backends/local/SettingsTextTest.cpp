#include "backends/local/SettingsText.h"

#include <gtest/gtest.h>

namespace welcomer::local {
namespace {

using Texts = std::vector<std::string>;

std::optional<std::string> valueIn(const SettingsText& settings, Setting setting) {
    return settings.values[static_cast<std::size_t>(setting)];
}

std::string problemWith(const std::string& line) {
    const SettingsText settings = readSettings(line);
    EXPECT_EQ(settings.problems.size(), 1U) << line;
    for (const auto& value : settings.values) {
        EXPECT_FALSE(value) << line;
    }
    return settings.problems.empty() ? "" : settings.problems.front();
}

} // namespace

TEST(SettingsTextTest, ALineGivesASettingItsValue) {
    const SettingsText settings = readSettings("OnlineAccountProvider=kind_2\n"
                                               "OnlineAccountServer=https://cloud.example:8443/a/b-c~1\n"
                                               "PluginFolder=/opt/Plug ins");
    EXPECT_EQ(valueIn(settings, Setting::OnlineAccountProvider), "kind_2");
    EXPECT_EQ(valueIn(settings, Setting::OnlineAccountServer), "https://cloud.example:8443/a/b-c~1");
    EXPECT_EQ(valueIn(settings, Setting::PluginFolder), "/opt/Plug ins");
    EXPECT_EQ(settings.problems, Texts{});
}

TEST(SettingsTextTest, BlanksCommentsAndEmptyLinesCountForNothing) {
    const SettingsText settings =
        readSettings("# PluginFolder=/a\n\n  ; PluginFolder=/b\r\n\t PluginFolder \t=  /c \r\n#\n");
    EXPECT_EQ(valueIn(settings, Setting::PluginFolder), "/c");
    EXPECT_EQ(settings.problems, Texts{});
}

TEST(SettingsTextTest, TheLastLineThatMakesSenseCounts) {
    const SettingsText settings = readSettings("PluginFolder=/a\nPluginFolder=/b\nPluginFolder=c\n");
    EXPECT_EQ(valueIn(settings, Setting::PluginFolder), "/b");
    EXPECT_EQ(settings.problems,
              Texts{"line 3: PluginFolder is not the path of a folder, which begins with /"});
}

TEST(SettingsTextTest, WhatMakesNoSenseIsToldWithItsLineAndCostsNoOther) {
    const SettingsText settings = readSettings("[Section]\nPluginFolder=/a\nPluginFoldr=/b\n");
    EXPECT_EQ(valueIn(settings, Setting::PluginFolder), "/a");
    EXPECT_EQ(settings.problems, (Texts{"line 1: this is no setting: there is no \"=\"",
                                        "line 3: there is no such setting: PluginFoldr"}));
}

TEST(SettingsTextTest, ANameThatCannotBeShownIsNot) {
    EXPECT_EQ(problemWith("\x1b[2J=1"), "line 1: there is no such setting");
    EXPECT_EQ(problemWith(std::string(65, 'a') + "=1"), "line 1: there is no such setting");
    EXPECT_EQ(problemWith(std::string(64, 'a') + "=1"),
              "line 1: there is no such setting: " + std::string(64, 'a'));
}

TEST(SettingsTextTest, AProviderIsLowerCaseLettersDigitsAndUnderscores) {
    for (const std::string& value : {std::string(), std::string("Owncloud"), std::string("a b"),
                                     std::string("a-b"), std::string(65, 'a')}) {
        EXPECT_EQ(problemWith("OnlineAccountProvider=" + value),
                  "line 1: OnlineAccountProvider is not a provider, such as owncloud");
    }
}

TEST(SettingsTextTest, AnAddressHasASchemeAHostAndAPath) {
    for (const char* const value :
         {"", "cloud.example", "https://cloud.example", "ftp://cloud.example/", "https:///", "https://-a/",
          "https://a-/", "https://a:/", "https://a:123456/", "https://a:80b/", "https://user@a/",
          "https://a/?q", "https://a/ b"}) {
        EXPECT_EQ(problemWith(std::string("OnlineAccountServer=") + value),
                  "line 1: OnlineAccountServer is not an address, such as https://services.example/")
            << value;
    }
    EXPECT_EQ(readSettings("OnlineAccountServer=https://a/" + std::string(1014, 'b')).problems, Texts{});
    EXPECT_EQ(readSettings("OnlineAccountServer=https://a/" + std::string(1015, 'b')).problems.size(), 1U);
}

TEST(SettingsTextTest, AnAccountServerIsAskedOverTLSOrASocketOfTheMachineAlone) {
    for (const char* const value : {"", "https://accounts.example", "https://accounts.example:8443/a/b/",
                                    "unix:/run/welcomer/socket"}) {
        EXPECT_EQ(valueIn(readSettings(std::string("AccountServer=") + value), Setting::AccountServer),
                  value);
    }
    for (const std::string& value :
         {std::string("http://accounts.example"), std::string("accounts.example"), std::string("https://"),
          std::string("https://user@a"), std::string("https://a/?q"), std::string("unix:run/a"),
          std::string("unix:"), "unix:/" + std::string(107, 'a'), "https://a/" + std::string(1015, 'b')}) {
        EXPECT_EQ(
            problemWith("AccountServer=" + value),
            "line 1: AccountServer is not https://HOST, perhaps with a port and a path, nor unix:/PATH");
    }
    EXPECT_EQ(problemWith("AccountServerAuthority=a"),
              "line 1: AccountServerAuthority is not the path of a file, which begins with /");
    EXPECT_EQ(readSettings("AccountServerAuthority=").problems, Texts{});
    EXPECT_EQ(problemWith("AccountServerRevocations=a"),
              "line 1: AccountServerRevocations is not the path of a file, which begins with /");
    EXPECT_EQ(readSettings("AccountServerRevocations=/etc/a.pem").problems, Texts{});
}

TEST(SettingsTextTest, SecondsAreAWholeNumberFromOneTo999) {
    for (const char* const value : {"", "0", "01", "1.5", "-1", "1000", "x"}) {
        for (const std::string name : {"AccountServerSeconds", "AccountServerConnectSeconds"}) {
            EXPECT_EQ(problemWith(name + "=" + value),
                      "line 1: " + name + " is not a number of seconds from 1 to 999");
        }
    }
    EXPECT_EQ(valueIn(readSettings("AccountServerSeconds=999"), Setting::AccountServerSeconds), "999");
}

TEST(SettingsTextTest, AFolderIsAnAbsolutePathWithoutControlCharacters) {
    for (const std::string& value :
         {std::string(), std::string("a"), std::string("/a\tb"), std::string("/a\x7f"), std::string("/\xff"),
          std::string("/a\0b", 4), "/" + std::string(4095, 'a')}) {
        EXPECT_EQ(problemWith("PluginFolder=" + value),
                  "line 1: PluginFolder is not the path of a folder, which begins with /");
    }
    EXPECT_EQ(readSettings("PluginFolder=/" + std::string(4094, 'a')).problems, Texts{});
}

TEST(SettingsTextTest, OfManyProblemsTheFirstOnesAreTold) {
    std::string text;
    for (std::size_t i = 0; i < kMaximumSettingsProblems; ++i) {
        text += "nonsense\n";
    }
    EXPECT_EQ(readSettings(text).problems.size(), kMaximumSettingsProblems);
    const Texts problems = readSettings(text + text).problems;
    ASSERT_EQ(problems.size(), kMaximumSettingsProblems + 1);
    EXPECT_EQ(problems.back(), "16 more lines make no sense");
}

} // namespace welcomer::local
