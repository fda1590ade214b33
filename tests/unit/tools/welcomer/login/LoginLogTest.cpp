#include "tools/welcomer/login/LoginLog.h"

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>

namespace welcomer::tool {
namespace {

using namespace std::chrono_literals;
using Microseconds = std::chrono::microseconds;

// 2026-11-22 12:00:00 UTC
constexpr Microseconds kNow{1795348800'000'000};

class LoginLogTest : public testing::Test {
  protected:
    LoginLogTest() {
        ::setenv("TZ", "UTC", 1);
        ::tzset();
        std::string pattern = testing::TempDir() + "/login-log-XXXXXX";
        root = ::mkdtemp(pattern.data());
        std::filesystem::create_directories(root / "var/log");
    }
    ~LoginLogTest() override { std::filesystem::remove_all(root); }

    void write(const std::string& name, const std::string& text) const {
        std::ofstream(root / "var/log" / name, std::ios::binary) << text;
    }

    std::vector<std::string> messages(std::size_t last = 100) const {
        const LoginQuery query{.root = root.string(), .userName = "anna", .last = last};
        std::vector<std::string> found;
        for (const LogLine& line : readSyslogFile(query, kNow).lines) {
            found.push_back(line.message);
        }
        return found;
    }

    std::filesystem::path root;
};

using Messages = std::vector<std::string>;

std::string shown(const char* text) {
    const auto line = readSyslogLine(text, kNow);
    return line ? std::to_string(line->wallClock.count() - kNow.count()) + "|" + line->program + "|" +
                      line->process + "|" + line->message
                : "none";
}

TEST_F(LoginLogTest, ALineInTheTraditionalFormat) {
    EXPECT_EQ(shown("Nov 22 11:59:58 host wlnimbussetup: Self destructing..."),
              "-2000000|wlnimbussetup||Self destructing...");
    EXPECT_EQ(shown("Nov 22 12:00:00 host wlnimbussetup[12]: a: b"), "0|wlnimbussetup|12|a: b");
    EXPECT_EQ(shown("Nov  2 12:00:00 host wlnimbussetup: a"), "-1728000000000|wlnimbussetup||a");
}

TEST_F(LoginLogTest, ATimeWithoutAYearIsNotInTheFuture) {
    EXPECT_EQ(shown("Dec 31 12:00:00 host p: a"), "-28166400000000|p||a"); // 326 days ago
}

TEST_F(LoginLogTest, ALineWithAnISOTime) {
    EXPECT_EQ(shown("2026-11-22T12:00:01.250000+00:00 host wlnimbussetup: a"), "1250000|wlnimbussetup||a");
    EXPECT_EQ(shown("2026-11-22T13:00:00+01:00 host p: a"), "0|p||a");
    EXPECT_EQ(shown("2026-11-22T09:30:00.5-02:30 host p: a"), "500000|p||a");
    EXPECT_EQ(shown("2026-11-22T12:00:00Z host p[7]: "), "0|p|7|");
}

TEST_F(LoginLogTest, WhatIsNoLineOfALogIsNone) {
    for (const char* text :
         {"", "Nov", "Nov 22", "Nov 22 11:59:58", "2026-11-22", "2026-13-22T12:00:00Z host p: a",
          "2026-11-22T12:00:00 host p: a", "Xyz 22 11:59:58 host p: a",
          "Nov 22 11:59:58 host last message repeated: 3 times"}) {
        EXPECT_EQ(shown(text), "none") << text;
    }
}

TEST_F(LoginLogTest, TheFilesAreLookedThroughInTurn) {
    EXPECT_FALSE(readSyslogFile({.root = root.string()}, kNow).isThere);
    write("user.log", "Nov 22 11:00:00 h wlnimbussetup: user\n");
    EXPECT_EQ(messages(), Messages{"user"});
    write("messages", "Nov 22 11:00:00 h other: line\nNov 22 11:00:00 h wlnimbussetup: messages\n");
    EXPECT_EQ(messages(), Messages{"messages"});
    write("syslog", "Nov 22 11:00:00 h welcomer-launch-agents: syslog\nno line at all\n");
    EXPECT_EQ(messages(), Messages{"syslog"});
}

TEST_F(LoginLogTest, TheFileFromBeforeItWasBegunAnewComesFirst) {
    write("syslog.1", "Nov 21 11:00:00 h wlnimbussetup: Self destructing...\n");
    write("syslog", "Nov 22 11:00:00 h wlnimbussetup: exiting");
    EXPECT_EQ(messages(), (Messages{"Self destructing...", "exiting"}));
}

TEST_F(LoginLogTest, OfALongFileTheEndIsRead) {
    std::string text = "Nov 22 11:00:00 h wlnimbussetup: far away\n";
    while (text.size() < std::size_t{9} * 1024 * 1024) {
        text += "Nov 22 11:00:00 h other: " + std::string(1000, 'x') + "\n";
    }
    write("syslog", text + "Nov 22 11:00:00 h wlnimbussetup: near\n");
    EXPECT_EQ(messages(), Messages{"near"});
}

TEST_F(LoginLogTest, TheLastLoginsAreEnough) {
    write("syslog",
          "Nov 22 11:00:00 h wlnimbussetup: Self destructing...\nNov 22 11:00:01 h wlnimbussetup: one\n"
          "Nov 22 11:01:00 h welcomer-launch-agents: before the second\n"
          "Nov 22 11:01:00 h wlnimbussetup: Self destructing...\nNov 22 11:01:01 h wlnimbussetup: two\n");
    EXPECT_EQ(messages(1), (Messages{"before the second", "Self destructing...", "two"}));
    EXPECT_EQ(messages(2).size(), 5U);
}

TEST_F(LoginLogTest, ASourceThatCannotBeReadIsSaidInOneLine) {
    const LoginQuery query{.root = root.string(), .userName = "anna"};
    EXPECT_EQ(findLogins(query).note, "there is neither a journal nor a syslog file to read");
    EXPECT_EQ(findLogins(query).source, "");
    write("syslog", "Nov 22 11:00:00 h wlnimbussetup: Self destructing...\n");
    const FoundLogins found = findLogins(query);
    EXPECT_EQ(found.source, "/var/log/syslog");
    EXPECT_EQ(found.note, "/var/log/syslog does not say which user a line is of");
    EXPECT_EQ(found.logins.size(), 1U);
}

TEST_F(LoginLogTest, LoginsThatEndedBeforeATimeAreLeftOut) {
    write("syslog", "2026-11-22T10:00:00Z h wlnimbussetup: Self destructing...\n2026-11-22T10:02:00Z h "
                    "wlnimbussetup: exiting\n"
                    "2026-11-22T11:00:00Z h wlnimbussetup: Self destructing...\n2026-11-22T11:02:00Z h "
                    "wlnimbussetup: exiting\n");
    LoginQuery query{.root = root.string(), .last = 100, .since = kNow - 59min};
    EXPECT_EQ(findLogins(query).logins.size(), 1U); // it was still going on
    query.since = kNow - 2h - 1min;
    EXPECT_EQ(findLogins(query).logins.size(), 2U);
    query.since = kNow;
    EXPECT_EQ(findLogins(query).logins.size(), 0U);
}

} // namespace
} // namespace welcomer::tool
