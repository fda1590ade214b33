#include "backends/desktop/DesktopRunLoops.h"

#include <gtest/gtest.h>

#include <thread>

namespace welcomer::desktop {

#ifdef WELCOMER_NO_RUNLOOP
TEST(DesktopRunLoopsTest, WithoutTheModuleTheMainThreadHasALocalLoop) {
    DesktopRunLoops runLoops;
    EXPECT_FALSE(runLoops.current()->hasForeignSources());
}
#else
TEST(DesktopRunLoopsTest, TheMainThreadsLoopIsGLibsAndOthersAreLocal) {
    DesktopRunLoops runLoops;
    std::thread([&] { EXPECT_FALSE(runLoops.current()->hasForeignSources()); }).join();
    EXPECT_TRUE(runLoops.current()->hasForeignSources());
    EXPECT_EQ(runLoops.report().backend, "GLib main context");
}

TEST(DesktopRunLoopsTest, TwoOfThemGiveTheMainThreadOneLoop) {
    DesktopRunLoops one;
    DesktopRunLoops other;
    EXPECT_EQ(one.current(), other.current());
}
#endif

} // namespace welcomer::desktop
