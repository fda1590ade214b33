#include "tools/welcomer/login/Since.h"

#include <cstdlib>
#include <ctime>
#include <gtest/gtest.h>

namespace welcomer::tool {
namespace {

using namespace std::chrono_literals;

// 2026-11-22 12:00:00 UTC
constexpr std::chrono::microseconds kNow{1795348800'000'000};

// How many seconds before now; none for what is no time.
std::optional<std::int64_t> before(const char* text) {
    ::setenv("TZ", "UTC", 1);
    ::tzset();
    const auto time = readSince(text, kNow);
    return time ? std::optional((kNow - *time) / 1s) : std::nullopt;
}

TEST(Since, HowLongAgo) {
    EXPECT_EQ(before("30s"), 30);
    EXPECT_EQ(before("10m"), 600);
    EXPECT_EQ(before("2h"), 7200);
    EXPECT_EQ(before("3d"), 3 * 86400);
}

TEST(Since, ADayOrATimeOfDay) {
    EXPECT_EQ(before("today"), 12 * 3600);
    EXPECT_EQ(before("yesterday"), 36 * 3600);
    EXPECT_EQ(before("11:59"), 60);
    EXPECT_EQ(before("11:59:58"), 2);
    EXPECT_EQ(before("2026-11-22"), 12 * 3600);
    EXPECT_EQ(before("2026-11-21 12:00"), 86400);
    EXPECT_EQ(before("2026-11-22 11:59:59"), 1);
}

TEST(Since, WhatIsNoTimeIsNone) {
    for (const char* text :
         {"", "h", "-2h", "2w", "2hh", "2026", "2026-11-22x", "25:00", "soon", "99999999999h"}) {
        EXPECT_EQ(before(text), std::nullopt) << text;
    }
}

} // namespace
} // namespace welcomer::tool
