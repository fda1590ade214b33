#include "platform/Platform.h"

#include "tests/fakes/FakePlatform.h"

#include <gtest/gtest.h>

namespace welcomer::platform {

TEST(PlatformDeathTest, WithoutAPlatformTheProcessEndsWithALineThatSaysSo) {
    EXPECT_EXIT(current(), testing::KilledBySignal(SIGABRT),
                "^welcomer: no platform is installed; [^\n]*\n$");
}

TEST(PlatformDeathTest, AScopeThatEndsLeavesThePlatformBeforeIt) {
    const fakes::FakePlatform outer;
    const fakes::FakePlatform inner;
    {
        const ScopedPlatform installed(outer.platform());
        {
            const ScopedPlatform other(inner.platform());
            EXPECT_EQ(&current(), &inner.platform());
        }
        EXPECT_EQ(&current(), &outer.platform());
    }
    EXPECT_EXIT(current(), testing::KilledBySignal(SIGABRT), "no platform");
}

} // namespace welcomer::platform
