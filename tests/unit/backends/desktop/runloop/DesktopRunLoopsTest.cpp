#include "backends/desktop/runloop/DesktopRunLoops.h"

#include <gtest/gtest.h>

#include <thread>
#include <typeinfo>

namespace welcomer::desktop {

namespace {

bool isLocal(const std::shared_ptr<platform::RunLoop>& loop) {
    const auto local = local::LocalRunLoops().current();
    const platform::RunLoop& one = *loop;
    const platform::RunLoop& other = *local;
    return typeid(one) == typeid(other);
}

} // namespace

#ifdef WELCOMER_NO_RUNLOOP
TEST(DesktopRunLoopsTest, WithoutTheModuleTheMainThreadHasALocalLoop) {
    DesktopRunLoops runLoops;
    EXPECT_TRUE(isLocal(runLoops.current()));
}
#else
TEST(DesktopRunLoopsTest, TheMainThreadsLoopIsGLibsAndOthersAreLocal) {
    DesktopRunLoops runLoops;
    std::thread([&] { EXPECT_TRUE(isLocal(runLoops.current())); }).join();
    EXPECT_FALSE(isLocal(runLoops.current()));
    EXPECT_EQ(runLoops.report().backend, "GLib main context");
}

TEST(DesktopRunLoopsTest, TwoOfThemGiveTheMainThreadOneLoop) {
    DesktopRunLoops one;
    DesktopRunLoops other;
    EXPECT_EQ(one.current(), other.current());
}
#endif

} // namespace welcomer::desktop
