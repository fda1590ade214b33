#include "plugins/PluginMark.h"

#include <gtest/gtest.h>
#include <stdexcept>
#include <thread>

namespace welcomer {
namespace {

TEST(PluginMark, AThreadIsInNoPluginAtFirst) {
    EXPECT_EQ(PluginMark::current(), nullptr);
}

TEST(PluginMark, MarksNest) {
    const PluginMark outer("outer");
    {
        const PluginMark inner("inner");
        EXPECT_STREQ(PluginMark::current(), "inner");
    }
    EXPECT_STREQ(PluginMark::current(), "outer");
}

TEST(PluginMark, AnExceptionTakesItsMarkAway) {
    try {
        const PluginMark mark("plug-in");
        throw std::runtime_error("no");
    } catch (const std::exception&) {
        EXPECT_EQ(PluginMark::current(), nullptr);
    }
}

TEST(PluginMark, EachThreadHasItsOwn) {
    const PluginMark mark("plug-in");
    std::thread([] { EXPECT_EQ(PluginMark::current(), nullptr); }).join();
    EXPECT_STREQ(PluginMark::current(), "plug-in");
}

} // namespace
} // namespace welcomer
