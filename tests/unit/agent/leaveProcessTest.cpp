#include "agent/leaveProcess.h"

#include <condition_variable>
#include <cstdlib>
#include <gtest/gtest.h>
#include <mutex>
#include <thread>

namespace welcomer {
namespace {

TEST(LeaveProcess, NoExitHandlerRunsUnderAThreadThatStillRuns) {
    EXPECT_EXIT(
        {
            std::thread([] {
                std::mutex mutex;
                std::unique_lock lock(mutex);
                std::condition_variable never;
                never.wait(lock, [] { return false; });
            }).detach();
            std::atexit([] { std::_Exit(7); });
            leaveProcess(0);
        },
        testing::ExitedWithCode(0), "");
}

TEST(LeaveProcess, TheStatusIsTheProcesss) {
    EXPECT_EXIT(leaveProcess(3), testing::ExitedWithCode(3), "");
}

} // namespace
} // namespace welcomer
