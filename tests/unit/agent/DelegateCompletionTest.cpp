#include "agent/DelegateCompletion.h"

#include "log/PCLogManager.h"
#include "tests/fakes/FakePlatform.h"
#include "tests/support/Processors.h"
#include "tests/unit/agent/TestDelegate.h"

#include <algorithm>
#include <atomic>
#include <functional>
#include <gtest/gtest.h>
#include <memory>
#include <new>
#include <stdexcept>
#include <string>
#include <system_error>
#include <utility>
#include <vector>

namespace welcomer {
namespace {

using namespace std::chrono_literals;
using Lines = std::vector<std::string>;

// Counts, so that a test sees every enter and leave.
class CountingGroup final : public platform::WorkGroup {
  public:
    int entered = 0;
    int left = 0;
    std::function<void()> whenLeft = [] {
    };

    void enter() override { ++entered; }
    void leave() override {
        ++left;
        whenLeft();
    }
    bool wait(std::chrono::nanoseconds) override { return entered == left; }
};

// Counts for other threads too.
class LeaveCounter final : public platform::WorkGroup {
  public:
    explicit LeaveCounter(std::atomic<int>& left) : _left(left) {}

    void enter() override {}
    void leave() override { ++_left; }
    bool wait(std::chrono::nanoseconds) override { return _left > 0; }

  private:
    std::atomic<int>& _left;
};

class DirectQueue final : public platform::DispatchQueue {
  public:
    void async(std::function<void()> block) override { block(); }
    void asyncAfter(std::chrono::nanoseconds, std::function<void()> block) override { block(); }
};

class FullQueue final : public platform::DispatchQueue {
  public:
    void async(std::function<void()>) override {
        throw std::system_error(std::make_error_code(std::errc::resource_unavailable_try_again), "no thread");
    }
    void asyncAfter(std::chrono::nanoseconds, std::function<void()> block) override {
        async(std::move(block));
    }
};

class DelegateCompletionTest : public testing::Test {
  protected:
    fakes::FakePlatform fake;
    const platform::ScopedPlatform installed{fake.platform()};
    std::shared_ptr<CountingGroup> group = std::make_shared<CountingGroup>();
    std::shared_ptr<platform::DispatchQueue> queue = std::make_shared<DirectQueue>();
    std::shared_ptr<DelegateCompletion> completion = std::make_shared<DelegateCompletion>("d", group, queue);
    TestDelegate plugin{"d"};
};

TEST_F(DelegateCompletionTest, EntersTheGroupWhenMadeAndLeavesItOnceWithItsOutcome) {
    EXPECT_EQ(group->entered, 1);
    EXPECT_EQ(group->left, 0);
    completion->complete(plugin, "response");
    EXPECT_EQ(group->entered, 1);
    EXPECT_EQ(group->left, 1);
}

TEST_F(DelegateCompletionTest, WhateverTheOutcomeItsLineIsLoggedBeforeTheGroupIsLeft) {
    std::vector<int> leftThen;
    PCLogManager::sharedManager().setObserver(
        [&](const PCLogManager::Call&) { leftThen.push_back(group->left); });
    completion->complete(plugin, "response");
    completion = std::make_shared<DelegateCompletion>("e", group, queue);
    completion->completeWithAliases(plugin, "response", std::nullopt);
    completion = std::make_shared<DelegateCompletion>("f", group, queue);
    completion->raised(std::make_exception_ptr(std::runtime_error("no")));
    PCLogManager::sharedManager().setObserver({});
    EXPECT_EQ(leftThen, (std::vector<int>{0, 1, 2}));
    EXPECT_EQ(group->left, 3);
    EXPECT_EQ(fake.systemLog.lines(),
              (Lines{"d setup: completed (0.000 seconds)", "e setup+chosen: completed (0.000 seconds)",
                     "exception in setup response for plugin f (0.000 seconds): no"}));
}

TEST_F(DelegateCompletionTest, HoldsItsQueueUntilTheOutcome) {
    const std::weak_ptr<platform::DispatchQueue> watched = std::exchange(queue, nullptr);
    CompletionHandler kept;
    plugin.complete = [&](const CompletionHandler& handler) {
        kept = handler;
    };
    completion->complete(plugin, "response");
    EXPECT_FALSE(watched.expired());
    kept(true, std::nullopt);
    EXPECT_TRUE(watched.expired());
}

TEST_F(DelegateCompletionTest, AnExceptionReleasesTheQueueToo) {
    const std::weak_ptr<platform::DispatchQueue> watched = std::exchange(queue, nullptr);
    completion->raised(std::make_exception_ptr(std::runtime_error("no")));
    EXPECT_TRUE(watched.expired());
}

TEST_F(DelegateCompletionTest, AHandlerThatIsKeptKeepsThePluginFromNothing) {
    auto keeper = std::make_shared<TestDelegate>("keeper");
    CompletionHandler kept;
    keeper->complete = [&kept](const CompletionHandler& handler) {
        kept = handler;
    };
    completion->queue([completion = completion, keeper] { completion->complete(*keeper, "response"); });
    const std::weak_ptr<TestDelegate> watched = keeper;
    keeper.reset();
    EXPECT_TRUE(watched.expired());
    kept(false, std::nullopt);
    EXPECT_EQ(group->left, 1);
}

TEST_F(DelegateCompletionTest, AQueueThatCannotTakeTheJobCountsAsAnException) {
    completion = std::make_shared<DelegateCompletion>("d", group, std::make_shared<FullQueue>());
    completion->queue([] { FAIL() << "the job was not taken"; });
    EXPECT_EQ(group->left, 1);
    const Lines lines = fake.systemLog.lines();
    ASSERT_EQ(lines.size(), 1U);
    const std::string beginning = "exception in setup response for plugin d (0.000 seconds): no thread";
    EXPECT_EQ(lines[0].substr(0, beginning.size()), beginning);
}

// A line that cannot be written, as when no memory is left for it.
class WithoutLines {
  public:
    WithoutLines() {
        PCLogManager::sharedManager().setObserver([](const PCLogManager::Call&) { throw std::bad_alloc(); });
    }
    ~WithoutLines() { PCLogManager::sharedManager().setObserver({}); }
    WithoutLines(const WithoutLines&) = delete;
    WithoutLines& operator=(const WithoutLines&) = delete;
};

TEST_F(DelegateCompletionTest, AnOutcomeThatCannotBeLoggedLeavesTheGroupOnceAndReleasesTheQueue) {
    const WithoutLines withoutLines;
    const std::weak_ptr<platform::DispatchQueue> watched = std::exchange(queue, nullptr);
    EXPECT_NO_THROW(completion->complete(plugin, "response"));
    EXPECT_EQ(group->left, 1);
    EXPECT_TRUE(watched.expired());
    completion = std::make_shared<DelegateCompletion>("e", group, std::make_shared<DirectQueue>());
    EXPECT_NO_THROW(completion->completeWithAliases(plugin, "response", std::nullopt));
    EXPECT_EQ(group->left, 2);
}

TEST_F(DelegateCompletionTest, AnExceptionThatCannotBeLoggedLeavesTheGroupOnceAndGoesNoFurther) {
    const WithoutLines withoutLines;
    plugin.complete = [](const CompletionHandler& handler) {
        handler(true, std::nullopt);
        throw std::runtime_error("too late");
    };
    EXPECT_NO_THROW(completion->complete(plugin, "response"));
    EXPECT_EQ(group->left, 1);
    completion = std::make_shared<DelegateCompletion>("e", group, queue);
    plugin.complete = [](const CompletionHandler&) {
        throw std::runtime_error("no");
    };
    EXPECT_NO_THROW(completion->completeWithAliases(plugin, "response", std::nullopt));
    EXPECT_EQ(group->left, 2);
}

TEST_F(DelegateCompletionTest, HandlerThenRaiseLogsBothAndLeavesOnce) {
    plugin.complete = [](const CompletionHandler& handler) {
        handler(true, std::nullopt);
        throw std::runtime_error("too late");
    };
    completion->completeWithAliases(plugin, "response", std::nullopt);
    EXPECT_EQ(group->left, 1);
    EXPECT_EQ(fake.systemLog.lines(),
              (Lines{"d setup+chosen: completed (0.000 seconds)",
                     "exception in setup response for plugin d (0.000 seconds): too late"}));
}

TEST_F(DelegateCompletionTest, RaiseThenHandlerLogsTheRaiseAloneAndLeavesOnce) {
    CompletionHandler kept;
    plugin.complete = [&](const CompletionHandler& handler) {
        kept = handler;
        throw std::runtime_error("first");
    };
    completion->complete(plugin, "response");
    EXPECT_EQ(group->left, 1);
    kept(true, std::nullopt);
    EXPECT_EQ(group->left, 1);
    EXPECT_EQ(fake.systemLog.lines(),
              (Lines{"exception in setup response for plugin d (0.000 seconds): first"}));
}

TEST_F(DelegateCompletionTest, TheHandlersSecondCallDoesNothing) {
    plugin.complete = [](const CompletionHandler& handler) {
        handler(true, std::nullopt);
        handler(false, platform::Error{1, "again"});
    };
    completion->complete(plugin, "response");
    completion = std::make_shared<DelegateCompletion>("e", group, queue);
    completion->completeWithAliases(plugin, "response", std::nullopt);
    EXPECT_EQ(group->left, 2);
    EXPECT_EQ(fake.systemLog.lines(),
              (Lines{"d setup: completed (0.000 seconds)", "e setup+chosen: completed (0.000 seconds)"}));
}

// The thread that comes last sees the other first, and so gives it a head start that grows: in some rounds
// both call at the same moment.
TEST_F(DelegateCompletionTest, OfTwoThreadsThatCallTheHandlerAtOnceOneGivesTheOutcome) {
    constexpr std::size_t kRounds = 2000;
    constexpr std::size_t kLongestStart = 200;
    std::vector<std::atomic<int>> left(kRounds);
    std::vector<CompletionHandler> handlers;
    plugin.complete = [&](const CompletionHandler& handler) {
        handlers.push_back(handler);
    };
    for (std::atomic<int>& count : left) {
        completion =
            std::make_shared<DelegateCompletion>("d", std::make_shared<LeaveCounter>(count), nullptr);
        completion->complete(plugin, "response");
    }
    runOnTwoProcessors([&](MeetingPoint& point) {
        for (std::size_t round = 0; round < kRounds; ++round) {
            for (std::size_t start = point.meet() ? round % kLongestStart : 0; start > 0; --start) {
                std::atomic_signal_fence(std::memory_order_seq_cst);
            }
            handlers[round](true, std::nullopt);
        }
    });
    EXPECT_TRUE(std::ranges::all_of(left, [](const std::atomic<int>& count) { return count == 1; }));
}

TEST_F(DelegateCompletionTest, TheQueueIsReleasedAfterTheGroupIsLeft) {
    const std::weak_ptr<platform::DispatchQueue> watched = std::exchange(queue, nullptr);
    bool wasHeld = false;
    group->whenLeft = [&] {
        wasHeld = !watched.expired();
    };
    completion->complete(plugin, "response");
    EXPECT_TRUE(wasHeld);
    EXPECT_TRUE(watched.expired());
}

TEST_F(DelegateCompletionTest, ARaiseIsTheOutcomeBeforeItIsLogged) {
    CompletionHandler kept;
    plugin.complete = [&](const CompletionHandler& handler) {
        kept = handler;
    };
    completion->complete(plugin, "response");
    PCLogManager::sharedManager().setObserver([&](const PCLogManager::Call&) {
        if (const CompletionHandler handler = std::exchange(kept, nullptr)) {
            handler(true, std::nullopt);
        }
    });
    completion->raised(std::make_exception_ptr(std::runtime_error("first")));
    PCLogManager::sharedManager().setObserver({});
    EXPECT_EQ(group->left, 1);
    EXPECT_EQ(fake.systemLog.lines(),
              (Lines{"exception in setup response for plugin d (0.000 seconds): first"}));
}

TEST_F(DelegateCompletionTest, WhateverAPluginThrowsIsCaughtAndLogged) {
    plugin.complete = [](const CompletionHandler&) {
        throw 42;
    };
    completion->complete(plugin, "response");
    completion = std::make_shared<DelegateCompletion>("d", group, queue);
    completion->completeWithAliases(plugin, "response", std::nullopt);
    EXPECT_EQ(group->left, 2);
    const Lines lines = fake.systemLog.lines();
    ASSERT_EQ(lines.size(), 2U);
    const std::string beginning = "exception in setup response for plugin d (0.000 seconds): ";
    for (const std::string& line : lines) {
        EXPECT_EQ(line.substr(0, beginning.size()), beginning);
        EXPECT_GT(line.size(), beginning.size()) << "the exception is missing";
    }
}

TEST_F(DelegateCompletionTest, AFailureLogsTheErrorOrNone) {
    plugin.complete = [](const CompletionHandler& handler) {
        handler(false, platform::Error{5, "server said no"});
    };
    completion->complete(plugin, "response");
    completion = std::make_shared<DelegateCompletion>("e", group, queue);
    plugin.complete = [](const CompletionHandler& handler) {
        handler(false, std::nullopt);
    };
    completion->completeWithAliases(plugin, "response", std::nullopt);
    EXPECT_EQ(fake.systemLog.lines(),
              (Lines{"d setup: server said no (0.000 seconds)", "e setup+chosen: (null) (0.000 seconds)"}));
}

TEST_F(DelegateCompletionTest, SuccessWithAnErrorIsCompleted) {
    plugin.complete = [](const CompletionHandler& handler) {
        handler(true, platform::Error{5, "ignored"});
    };
    completion->complete(plugin, "response");
    EXPECT_EQ(fake.systemLog.lines(), (Lines{"d setup: completed (0.000 seconds)"}));
}

TEST_F(DelegateCompletionTest, SecondsAreCountedFromTheStartWithThreeDecimals) {
    fake.virtualTime.sleep(1234567us);
    completion->complete(plugin, "response");
    completion = std::make_shared<DelegateCompletion>("e", group, queue);
    fake.virtualTime.sleep(61s + 500ms);
    completion->raised(std::make_exception_ptr(std::runtime_error("no")));
    EXPECT_EQ(fake.systemLog.lines(),
              (Lines{"d setup: completed (1.235 seconds)",
                     "exception in setup response for plugin e (61.500 seconds): no"}));
}

} // namespace
} // namespace welcomer
