#include "tests/fakes/RecordedTime.h"

#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <fstream>
#include <functional>
#include <memory>
#include <string>
#include <thread>
#include <unistd.h>
#include <vector>

namespace welcomer::simulated {
namespace {

using namespace std::chrono_literals;
using Wait = fakes::RecordedTime::Wait;
using Names = std::vector<std::string>;

// Whether the kernel has a thread of this process wait for something.
bool isWaiting(pid_t thread) {
    std::ifstream file("/proc/self/task/" + std::to_string(thread) + "/stat");
    std::string text;
    std::getline(file, text);
    return text.find(") S ") != std::string::npos;
}

class VirtualTimeTest : public testing::Test {
  protected:
    std::function<void()> note(const std::string& name) {
        return [this, name] {
            names.push_back(name);
        };
    }

    fakes::RecordedTime time;
    Names names;
};

TEST_F(VirtualTimeTest, StartsAtZeroAndMovesOnlyInsideAWait) {
    time.global().asyncAfter(3s, note("late"));
    EXPECT_EQ(time.now(), 0s);
    time.sleep(2s);
    EXPECT_EQ(time.now(), 2s);
    EXPECT_TRUE(names.empty());
    time.sleep(2s);
    EXPECT_EQ(time.now(), 4s);
    EXPECT_EQ(names, Names{"late"});
}

TEST_F(VirtualTimeTest, RunsBlocksByDueTimeThenInTheOrderOfPosting) {
    const auto queue = time.createSerial("one");
    time.global().asyncAfter(2s, note("2 s"));
    time.global().asyncAfter(1s, note("1 s, first"));
    queue->async(note("at once, first"));
    queue->asyncAfter(1s, note("1 s, second"));
    time.current()->perform(note("at once, second"));
    time.global().async(note("at once, third"));
    const auto port = time.current()->attachPort();
    time.current()->run(2s);
    EXPECT_EQ(names, (Names{"at once, first", "at once, second", "at once, third", "1 s, first",
                            "1 s, second", "2 s"}));
}

TEST_F(VirtualTimeTest, ABlockSeesTheTimeAtWhichItWasDue) {
    std::vector<std::chrono::nanoseconds> times;
    time.global().asyncAfter(1s, [&] {
        times.push_back(time.now());
        time.global().asyncAfter(500ms, [&] { times.push_back(time.now()); });
    });
    time.sleep(10s);
    EXPECT_EQ(times, (std::vector<std::chrono::nanoseconds>{1s, 1500ms}));
}

TEST_F(VirtualTimeTest, WhatIsDueAtTheVeryEndOfAWaitRunsInIt) {
    const auto group = time.createGroup();
    group->enter();
    time.global().asyncAfter(100ms, [group] { group->leave(); });
    EXPECT_TRUE(group->wait(100ms));
    EXPECT_EQ(time.now(), 100ms);
}

TEST_F(VirtualTimeTest, AGroupThatNobodyLeavesTimesOutInSlices) {
    const auto group = time.createGroup();
    group->enter();
    for (int slice = 0; slice < 3; ++slice)
        EXPECT_FALSE(group->wait(100ms));
    EXPECT_EQ(time.now(), 300ms);
    EXPECT_EQ(time.waits(), (std::vector<Wait>(3, Wait{Wait::Kind::Group, 100ms})));
}

TEST_F(VirtualTimeTest, AGroupThatIsLeftEndsTheWaitAtThatMoment) {
    const auto group = time.createGroup();
    group->enter();
    time.global().asyncAfter(30ms, [group] { group->leave(); });
    EXPECT_TRUE(group->wait(100ms));
    EXPECT_EQ(time.now(), 30ms);
}

TEST_F(VirtualTimeTest, ARunLoopWithoutSourceReturnsAtOnceAndOneWithAPortLingers) {
    time.current()->run(120s);
    EXPECT_EQ(time.now(), 0s);
    auto port = time.current()->attachPort();
    time.current()->run(120s);
    EXPECT_EQ(time.now(), 120s);
    port.reset();
    time.current()->run(120s);
    EXPECT_EQ(time.now(), 120s);
    EXPECT_EQ(time.waits(), (std::vector<Wait>(3, Wait{Wait::Kind::Run, 120s})));
}

TEST_F(VirtualTimeTest, ARunLoopWithoutSourceStillRunsTheQueuesBlocksThatAreDue) {
    time.global().async([this] { time.current()->perform(note("performed")); });
    time.current()->run(1s);
    EXPECT_EQ(names, Names{"performed"});
    EXPECT_EQ(time.now(), 0s);
}

TEST_F(VirtualTimeTest, PerformedBlocksWaitForTheRunLoop) {
    time.current()->perform(note("performed"));
    const auto group = time.createGroup();
    group->enter();
    EXPECT_FALSE(group->wait(1s));
    time.sleep(1s);
    EXPECT_TRUE(names.empty());
    time.current()->run(0s);
    EXPECT_EQ(names, Names{"performed"});
}

TEST_F(VirtualTimeTest, ABlockThatWaitsLetsOtherQueuesRunButNotItsOwn) {
    const auto first = time.createSerial("first");
    const auto second = time.createSerial("second");
    first->async([this] {
        names.push_back("begin");
        time.sleep(1s);
        names.push_back("end");
    });
    first->async(note("after"));
    second->async(note("beside"));
    time.settle();
    EXPECT_EQ(names, (Names{"begin", "beside", "end", "after"}));
}

TEST_F(VirtualTimeTest, ABlockThatWaitsLongerThanTheWaitAroundItDelaysItsEnd) {
    time.global().asyncAfter(50ms, [this] { time.sleep(300ms); });
    time.sleep(100ms);
    EXPECT_EQ(time.now(), 350ms);
}

TEST_F(VirtualTimeTest, SettleRunsWhatIsDueAndWhatThatPostsWithoutAdvancing) {
    time.global().async([this] {
        names.push_back("outer");
        time.global().async(note("inner"));
        time.global().asyncAfter(1ns, note("later"));
    });
    time.settle();
    EXPECT_EQ(names, (Names{"outer", "inner"}));
    EXPECT_EQ(time.now(), 0s);
    EXPECT_TRUE(time.waits().empty());
}

TEST_F(VirtualTimeTest, RemembersTheNamesOfItsSerialQueues) {
    time.createSerial("one");
    time.createSerial("two");
    EXPECT_EQ(time.queueNames(), (Names{"one", "two"}));
}

TEST_F(VirtualTimeTest, DropsWhatHasNotRunWhenItIsDestroyed) {
    const auto held = std::make_shared<int>(0);
    auto temporary = std::make_unique<VirtualTime>();
    const auto queue = temporary->createSerial("kept");
    const auto loop = temporary->current();
    const auto group = temporary->createGroup();
    group->enter();
    queue->async([held, queue] {});
    loop->perform([held, loop] {});
    temporary.reset();
    EXPECT_EQ(held.use_count(), 1);
    queue->async([held] {});
    EXPECT_EQ(held.use_count(), 1);
    EXPECT_FALSE(group->wait(1h));
}

TEST_F(VirtualTimeTest, AWaitOfAnotherThreadIsNotOvertaken) {
    const auto group = time.createGroup();
    group->enter();
    std::chrono::nanoseconds wokenAt = 0s;
    std::thread sleeper([&] {
        time.sleep(1s);
        wokenAt = time.now();
        group->leave();
    });
    while (time.waits().empty())
        std::this_thread::yield();
    EXPECT_TRUE(group->wait(std::chrono::nanoseconds::max()));
    sleeper.join();
    EXPECT_EQ(wokenAt, 1s);
}

TEST_F(VirtualTimeTest, TimeStandsStillWhileAnotherThreadRunsABlock) {
    std::chrono::nanoseconds before = -1s;
    std::chrono::nanoseconds after = -1s;
    std::atomic<bool> started = false;
    std::atomic<bool> proceed = false;
    time.global().async([&] {
        started = true;
        before = time.now();
        while (!proceed)
            std::this_thread::yield();
        after = time.now();
    });
    std::thread runner([&] { time.settle(); });
    while (!started)
        std::this_thread::yield();
    std::atomic<pid_t> sleeperID = 0;
    std::atomic<bool> slept = false;
    std::thread sleeper([&] {
        sleeperID = ::gettid();
        time.sleep(1s);
        slept = true;
    });
    while (time.waits().empty())
        std::this_thread::yield();
    while (!slept && !isWaiting(sleeperID))
        std::this_thread::yield();
    proceed = true;
    runner.join();
    sleeper.join();
    EXPECT_EQ(before, 0s);
    EXPECT_EQ(after, 0s);
    EXPECT_EQ(time.now(), 1s);
}

class VirtualTimeWithRealThreadsTest : public VirtualTimeTest {
  protected:
    VirtualTimeWithRealThreadsTest() { group->enter(); }

    fakes::RecordedTime real{VirtualTime::OutstandingWork::OnRealThreads};
    const std::shared_ptr<platform::WorkGroup> group = real.createGroup();
};

TEST_F(VirtualTimeWithRealThreadsTest, TimeStandsStillWhileAGroupIsNotEmpty) {
    std::thread worker([this] {
        while (real.waits().empty())
            std::this_thread::yield();
        EXPECT_EQ(real.now(), 0s);
        group->leave();
    });
    EXPECT_TRUE(group->wait(100ms));
    worker.join();
    EXPECT_EQ(real.now(), 0s);
}

TEST_F(VirtualTimeWithRealThreadsTest, TimeAdvancesOnceEveryGroupIsEmpty) {
    group->leave();
    const auto port = real.current()->attachPort();
    real.current()->run(120s);
    EXPECT_EQ(real.now(), 120s);
}

TEST_F(VirtualTimeWithRealThreadsTest, AGroupThatIsReleasedHoldsTimeNoLonger) {
    auto other = real.createGroup();
    other->enter();
    group->leave();
    other.reset();
    const auto port = real.current()->attachPort();
    real.current()->run(1s);
    EXPECT_EQ(real.now(), 1s);
}

TEST_F(VirtualTimeWithRealThreadsTest, AWaitForTheGroupRunsWhatOtherThreadsPost) {
    std::thread worker([this] {
        while (real.waits().empty())
            std::this_thread::yield();
        real.createSerial("queue")->async([this] { group->leave(); });
    });
    EXPECT_TRUE(group->wait(100ms));
    worker.join();
}

TEST_F(VirtualTimeWithRealThreadsTest, APerformedBlockTurnsTheWaitOverToTheRunLoop) {
    const auto loop = real.current();
    bool done = false;
    std::thread worker([&] {
        while (real.waits().empty())
            std::this_thread::yield();
        loop->perform([&] { done = true; });
    });
    EXPECT_FALSE(group->wait(100ms));
    EXPECT_FALSE(done);
    const auto port = loop->attachPort();
    loop->run(1s);
    EXPECT_TRUE(done);
    EXPECT_EQ(real.now(), 0s);
    worker.join();
}

TEST_F(VirtualTimeWithRealThreadsTest, AJobOfTheGroupCanSleep) {
    real.createSerial("queue")->async([this] {
        real.sleep(2s);
        group->leave();
    });
    EXPECT_TRUE(group->wait(100ms));
    EXPECT_EQ(real.now(), 2s);
}

} // namespace
} // namespace welcomer::simulated
