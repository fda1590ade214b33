// What the local queues promise beyond the interface: how many threads there are, and what happens when there
// can be none.

#include "backends/local/time/LocalDispatchQueues.h"

#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <filesystem>
#include <future>
#include <iterator>
#include <memory>
#include <mutex>
#include <stdexcept>
#include <thread>
#include <vector>

namespace welcomer::local {
namespace {

using namespace std::chrono_literals;

constexpr std::chrono::seconds tooLong{60};

std::ptrdiff_t threadsOfThisProcess() {
    return std::distance(std::filesystem::directory_iterator("/proc/self/task"), {});
}

// Threads that end have left the process a moment later.
bool threadsFallTo(std::ptrdiff_t number) {
    const auto end = std::chrono::steady_clock::now() + tooLong;
    while (threadsOfThisProcess() > number) {
        if (std::chrono::steady_clock::now() > end)
            return false;
        std::this_thread::sleep_for(1ms);
    }
    return true;
}

// How many threads there are without any of ours. The thread sanitizer starts a thread of its own with the
// first one that a process starts, so one is started before counting, and seen to leave.
std::ptrdiff_t threadsWithoutOurs() {
    std::filesystem::path thread;
    std::thread([&thread] { thread = std::filesystem::canonical("/proc/thread-self"); }).join();
    while (std::filesystem::exists(thread))
        std::this_thread::yield();
    return threadsOfThisProcess();
}

// Keeps the threads that are asked for, to be run by hand.
class ThreadsByHand {
  public:
    LocalDispatchQueues::ThreadStarter starter() {
        return [this](std::function<void()> function) {
            if (refuses)
                return ++refused, false;
            waiting.push_back(std::move(function));
            return true;
        };
    }

    // Runs the next one on the calling thread, to its end.
    void runNext() {
        const std::function<void()> function = std::move(waiting.front());
        waiting.erase(waiting.begin());
        function();
    }

    bool refuses = false;
    int refused = 0;
    std::vector<std::function<void()>> waiting;
};

TEST(LocalDispatchQueuesTest, OwnsNoThreadBeforeAndAfterWork) {
    const auto before = threadsWithoutOurs();
    LocalDispatchQueues queues;
    const auto queue = queues.createSerial("serial");
    const auto group = queues.createGroup();
    EXPECT_EQ(threadsOfThisProcess(), before);
    for (int job = 0; job < 100; ++job) {
        group->enter();
        (job % 2 ? *queue : queues.global()).async([group] { group->leave(); });
    }
    group->enter();
    queue->asyncAfter(10ms, [group] { group->leave(); });
    ASSERT_TRUE(group->wait(tooLong));
    EXPECT_TRUE(threadsFallTo(before));
}

TEST(LocalDispatchQueuesTest, OneThreadAtMostSleepsForAllDelayedBlocks) {
    const auto before = threadsWithoutOurs();
    LocalDispatchQueues queues;
    for (int job = 0; job < 100; ++job)
        queues.global().asyncAfter(1h, [] {});
    EXPECT_TRUE(threadsFallTo(before + 1));
}

TEST(LocalDispatchQueuesTest, NoThreadSleepsForADelayThatNeverEnds) {
    ThreadsByHand threads;
    LocalDispatchQueues queues(threads.starter());
    queues.global().asyncAfter(std::chrono::nanoseconds::max(), [] {});
    EXPECT_TRUE(threads.waiting.empty());
}

TEST(LocalDispatchQueuesTest, AThousandQuickBlocksNeedNoThousandThreads) {
    ThreadsByHand threads;
    LocalDispatchQueues queues(threads.starter());
    int ran = 0;
    for (int job = 0; job < 1000; ++job)
        queues.createSerial("serial")->async([&ran] { ++ran; });
    EXPECT_EQ(threads.waiting.size(), 1U);
    threads.runNext();
    EXPECT_EQ(ran, 1000);
    ASSERT_EQ(threads.waiting.size(), 1U); // started when the first took its first block
    threads.runNext();
    EXPECT_TRUE(threads.waiting.empty());
}

TEST(LocalDispatchQueuesTest, AThreadStartsTheNextBeforeItRunsABlockWhileMoreIsReady) {
    ThreadsByHand threads;
    LocalDispatchQueues queues(threads.starter());
    std::vector<std::size_t> waitingThreads;
    for (int job = 0; job < 2; ++job)
        queues.global().async([&] { waitingThreads.push_back(threads.waiting.size()); });
    threads.runNext();
    EXPECT_EQ(waitingThreads, (std::vector<std::size_t>{1, 1}));
    threads.runNext();
}

TEST(LocalDispatchQueuesTest, WithoutAnyThreadThePostingThreadRunsTheBlocksInOrder) {
    ThreadsByHand threads;
    threads.refuses = true;
    LocalDispatchQueues queues(threads.starter());
    const auto queue = queues.createSerial("serial");
    std::vector<int> order;
    queue->async([&] {
        queue->async([&] { order.push_back(2); });
        order.push_back(1);
    });
    EXPECT_EQ(order, (std::vector<int>{1, 2}));
}

TEST(LocalDispatchQueuesTest, ABlockThatGetsNoThreadRunsOnTheNextFreeOne) {
    ThreadsByHand threads;
    LocalDispatchQueues queues(threads.starter());
    std::vector<int> order;
    queues.global().async([&] {
        threads.refuses = true;
        queues.global().async([&] { order.push_back(2); });
        order.push_back(1);
    });
    threads.runNext();
    EXPECT_EQ(threads.refused, 1);
    EXPECT_EQ(order, (std::vector<int>{1, 2}));
}

TEST(LocalDispatchQueuesTest, ADelayedBlockThatGetsNoThreadIsNotLost) {
    ThreadsByHand threads;
    threads.refuses = true;
    LocalDispatchQueues queues(threads.starter());
    bool ran = false;
    queues.global().asyncAfter(1ms, [&] { ran = true; });
    EXPECT_FALSE(ran);
    threads.refuses = false;
    queues.global().async([] {});
    ASSERT_EQ(threads.waiting.size(), 1U);
    threads.runNext(); // keeps time until the block is due
    EXPECT_TRUE(ran);
    threads.runNext();
}

TEST(LocalDispatchQueuesTest, TheThreadThatKeepsTimeHelpsOutWhenThereIsNoOther) {
    std::atomic<int> started = 0;
    LocalDispatchQueues queues([&](std::function<void()> function) {
        if (++started > 1)
            return false;
        std::thread(std::move(function)).detach();
        return true;
    });
    const auto group = queues.createGroup();
    queues.global().asyncAfter(1h, [] {});
    std::this_thread::sleep_for(20ms); // it sleeps by now, most likely
    group->enter();
    queues.global().async([group] { group->leave(); });
    EXPECT_TRUE(group->wait(tooLong));
}

TEST(LocalDispatchQueuesTest, AnEarlierDelayedBlockWakesTheThreadThatKeepsTime) {
    LocalDispatchQueues queues;
    const auto group = queues.createGroup();
    queues.global().asyncAfter(1h, [] {});
    std::this_thread::sleep_for(20ms);
    group->enter();
    queues.global().asyncAfter(1ms, [group] { group->leave(); });
    EXPECT_TRUE(group->wait(tooLong));
}

TEST(LocalDispatchQueuesTest, WhatABlockHoldsIsReleasedWhileOthersMayPost) {
    ThreadsByHand threads;
    LocalDispatchQueues queues(threads.starter());
    const auto queue = queues.createSerial("serial");
    int released = 0;
    int couldPost = 0;
    std::vector<std::future<void>> posts;
    // Its deletion waits for another thread that posts.
    const auto makeHeld = [&] {
        return std::shared_ptr<void>(nullptr, [&](void*) {
            posts.push_back(std::async(std::launch::async, [&] { queues.global().async([] {}); }));
            ++released;
            if (posts.back().wait_for(tooLong / 6) == std::future_status::ready)
                ++couldPost;
        });
    };
    queues.global().async([held = makeHeld()] {});
    queue->async([held = makeHeld()] {});
    queue->async([held = makeHeld()] {}); // the last one of its queue
    while (!threads.waiting.empty())
        threads.runNext();
    for (const std::future<void>& post : posts)
        post.wait();
    while (!threads.waiting.empty()) // of a post that came late, for the queues' end
        threads.runNext();
    EXPECT_EQ(released, 3);
    EXPECT_EQ(couldPost, 3);
}

TEST(LocalDispatchQueuesTest, DestructionWaitsForRunningBlocksAndDropsTheRest) {
    std::atomic<bool> started = false;
    std::atomic<bool> finished = false;
    std::atomic<bool> ranMore = false;
    const auto held = std::make_shared<int>(0);
    std::shared_ptr<platform::DispatchQueue> queue;
    {
        LocalDispatchQueues queues;
        queue = queues.createSerial("serial");
        queue->async([&] {
            started = true;
            std::this_thread::sleep_for(50ms);
            finished = true;
        });
        queue->async([&ranMore, held, queue] { ranMore = true; });
        queues.global().asyncAfter(1h, [&ranMore, held] { ranMore = true; });
        while (!started)
            std::this_thread::yield();
    }
    EXPECT_TRUE(finished);
    EXPECT_FALSE(ranMore);
    queue->async([&ranMore, held] { ranMore = true; });
    queue->asyncAfter(1ms, [&ranMore, held] { ranMore = true; });
    EXPECT_EQ(held.use_count(), 1);
}

TEST(LocalDispatchQueuesDeathTest, ABlockThatThrowsEndsTheProcess) {
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    EXPECT_DEATH(
        {
            LocalDispatchQueues queues;
            const auto group = queues.createGroup();
            group->enter();
            queues.global().async([] { throw std::runtime_error("from a block"); });
            group->wait(tooLong);
        },
        "from a block");
}

} // namespace
} // namespace welcomer::local
