#include "tests/contract/TimeBackends.h"

#include <functional>
#include <memory>
#include <string>
#include <thread>
#include <vector>

namespace welcomer::contract {
namespace {

using namespace std::chrono_literals;
using Names = std::vector<std::string>;

template <typename Backend>
class RunLoopContract : public testing::Test {
  protected:
    // The thread's loop may outlive the test: nothing of it stays pending.
    void TearDown() override { loop->run(0ns); }

    std::function<void()> note(const std::string& name) {
        return [this, name] {
            names.push_back(name);
        };
    }

    std::chrono::nanoseconds timeOfRunning(std::chrono::nanoseconds duration) {
        const auto before = backend.clock.now();
        loop->run(duration);
        return backend.clock.now() - before;
    }

    Backend backend;
    const std::shared_ptr<platform::RunLoop> loop = backend.runLoops.current();
    std::unique_ptr<platform::RunLoopPort> port;
    Names names;
};

TYPED_TEST_SUITE(RunLoopContract, TimeBackends, TimeBackendNames);

TYPED_TEST(RunLoopContract, ReturnsAtOnceWhenNothingIsAttachedUnlessItHasForeignSources) {
    if (TypeParam::hasForeignSources)
        EXPECT_GE(this->timeOfRunning(50ms), 50ms);
    else
        EXPECT_LT(this->timeOfRunning(120s), tooLong);
}

TYPED_TEST(RunLoopContract, APortKeepsItRunningForTheWholeDuration) {
    this->port = this->loop->attachPort();
    EXPECT_GE(this->timeOfRunning(50ms), 50ms);
}

TYPED_TEST(RunLoopContract, EachOfSeveralPortsKeepsItRunning) {
    this->port = this->loop->attachPort();
    this->loop->attachPort().reset();
    EXPECT_GE(this->timeOfRunning(50ms), 50ms);
}

TYPED_TEST(RunLoopContract, ReturnsWhenTheLastPortIsGone) {
    if (TypeParam::hasForeignSources)
        return;
    this->port = this->loop->attachPort();
    this->backend.dispatchQueues.global().asyncAfter(20ms, [this] { this->port.reset(); });
    EXPECT_LT(this->timeOfRunning(2 * tooLong), tooLong);
}

TYPED_TEST(RunLoopContract, RunningForNothingOrLessReturnsAtOnce) {
    this->port = this->loop->attachPort();
    EXPECT_LT(this->timeOfRunning(0ns), tooLong);
    EXPECT_LT(this->timeOfRunning(-1h), tooLong);
    EXPECT_LT(this->timeOfRunning(std::chrono::nanoseconds::min()), tooLong);
}

TYPED_TEST(RunLoopContract, RunsPendingBlocksEvenForNothing) {
    this->loop->perform(this->note("pending"));
    this->loop->run(0ns);
    EXPECT_EQ(this->names, Names{"pending"});
}

TYPED_TEST(RunLoopContract, RunsBlocksInTheOrderOfTheCallsAndOnce) {
    Names expected;
    for (int block = 0; block < 100; ++block) {
        expected.push_back(std::to_string(block));
        this->loop->perform(this->note(expected.back()));
    }
    this->loop->run(0ns);
    this->loop->run(0ns);
    EXPECT_EQ(this->names, expected);
}

TYPED_TEST(RunLoopContract, NeverRunsABlockBeforePerformReturns) {
    this->loop->perform(this->note("block"));
    EXPECT_TRUE(this->names.empty());
    this->backend.clock.sleep(10ms);
    EXPECT_TRUE(this->names.empty());
}

TYPED_TEST(RunLoopContract, ABlockPerformedInABlockRunsAfterItInTheSameRun) {
    this->port = this->loop->attachPort();
    this->loop->perform([this] {
        this->loop->perform(this->note("inner"));
        this->names.push_back("outer");
    });
    this->loop->perform(this->note("beside"));
    this->loop->run(20ms);
    EXPECT_EQ(this->names, (Names{"outer", "beside", "inner"}));
}

TYPED_TEST(RunLoopContract, WithoutASourceItStaysUntilNothingIsPending) {
    this->loop->perform([this] { this->loop->perform(this->note("inner")); });
    this->loop->run(TypeParam::hasForeignSources ? 200ms : std::chrono::milliseconds(tooLong));
    EXPECT_EQ(this->names, Names{"inner"});
}

TYPED_TEST(RunLoopContract, ABlockMayRunTheLoopItself) {
    this->loop->perform([this] {
        this->names.push_back("begin");
        this->loop->run(0ns);
        this->names.push_back("end");
    });
    this->loop->perform(this->note("next"));
    this->loop->run(0ns);
    EXPECT_EQ(this->names, (Names{"begin", "next", "end"}));
}

TYPED_TEST(RunLoopContract, ABlockPerformedMeanwhileWakesIt) {
    this->port = this->loop->attachPort();
    this->backend.dispatchQueues.global().asyncAfter(
        20ms, [this] { this->loop->perform([this] { this->port.reset(); }); });
    if (TypeParam::hasForeignSources)
        EXPECT_GE(this->timeOfRunning(200ms), 200ms);
    else
        EXPECT_LT(this->timeOfRunning(2 * tooLong), tooLong);
    EXPECT_FALSE(this->port);
}

TYPED_TEST(RunLoopContract, BlocksRunOnTheLoopsOwnThread) {
    this->port = this->loop->attachPort();
    std::thread::id ranOn;
    this->backend.dispatchQueues.global().async([this, &ranOn] {
        this->loop->perform([this, &ranOn] {
            ranOn = std::this_thread::get_id();
            this->port.reset();
        });
    });
    this->loop->run(TypeParam::hasForeignSources ? 200ms : std::chrono::milliseconds(tooLong));
    EXPECT_EQ(ranOn, std::this_thread::get_id());
}

TYPED_TEST(RunLoopContract, EveryThreadHasALoopOfItsOwn) {
    EXPECT_EQ(this->backend.runLoops.current(), this->loop);
    std::shared_ptr<platform::RunLoop> other;
    std::thread([&] {
        other = this->backend.runLoops.current();
        EXPECT_EQ(this->backend.runLoops.current(), other);
        other->perform(this->note("other"));
        this->loop->run(0ns);
        other->run(0ns);
    }).join();
    EXPECT_NE(other, this->loop);
    EXPECT_EQ(this->names, Names{"other"});
}

TYPED_TEST(RunLoopContract, ALoopMayOutliveItsThreadAndThenRunsNothing) {
    std::shared_ptr<platform::RunLoop> orphan;
    std::thread([&] {
        orphan = this->backend.runLoops.current();
        orphan->perform(this->note("before"));
    }).join();
    orphan->perform(this->note("after"));
    this->port = orphan->attachPort();
    orphan.reset();
    this->loop->run(0ns);
    std::thread([&] { this->backend.runLoops.current()->run(0ns); }).join();
    EXPECT_TRUE(this->names.empty());
}

TYPED_TEST(RunLoopContract, TakesBlocksFromManyThreads) {
    int ran = 0;
    std::vector<std::thread> threads;
    this->port = this->loop->attachPort();
    for (int number = 0; number < 4; ++number) {
        threads.emplace_back([this, &ran] {
            for (int block = 0; block < 250; ++block)
                this->loop->perform([&ran] { ++ran; });
        });
    }
    while (ran < 1000)
        this->loop->run(1ms);
    for (std::thread& thread : threads)
        thread.join();
    EXPECT_EQ(ran, 1000);
}

} // namespace
} // namespace welcomer::contract
