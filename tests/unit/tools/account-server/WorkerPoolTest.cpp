#include "tools/account-server/WorkerPool.h"

#include <gtest/gtest.h>

#include <atomic>
#include <latch>

namespace welcomer::server {
namespace {

TEST(WorkerPool, TakesNoMoreThanItsThreadsAndItsQueueHold) {
    std::latch isBusy(1);
    std::latch mayGoOn(1);
    std::atomic<int> done = 0;
    {
        WorkerPool pool(1, 2);
        ASSERT_TRUE(pool.take([&] {
            isBusy.count_down();
            mayGoOn.wait();
            ++done;
        }));
        isBusy.wait();
        EXPECT_TRUE(pool.take([&] { ++done; }));
        EXPECT_TRUE(pool.take([&] { ++done; }));
        EXPECT_FALSE(pool.take([&] { ++done; }));
        mayGoOn.count_down();
    }
    EXPECT_EQ(done, 3);
}

TEST(WorkerPool, EndsOnlyWhenEverythingIsDone) {
    std::atomic<int> done = 0;
    {
        WorkerPool pool(2, 100);
        for (int i = 0; i < 50; ++i) {
            EXPECT_TRUE(pool.take([&] { ++done; }));
        }
    }
    EXPECT_EQ(done, 50);
}

} // namespace
} // namespace welcomer::server
