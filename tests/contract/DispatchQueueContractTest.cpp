#include "tests/contract/TimeBackends.h"

#include <atomic>
#include <functional>
#include <memory>
#include <string>
#include <vector>

namespace welcomer::contract {
namespace {

using namespace std::chrono_literals;

template <typename Backend>
class DispatchQueueContract : public testing::Test {
  protected:
    using Groups = std::vector<std::shared_ptr<platform::WorkGroup>>;

    // Posts work that `done` waits for.
    void post(platform::DispatchQueue& queue, std::function<void()> block) {
        done->enter();
        queue.async(finishing(std::move(block)));
    }

    void postAfter(platform::DispatchQueue& queue, std::chrono::nanoseconds delay,
                   std::function<void()> block) {
        done->enter();
        queue.asyncAfter(delay, finishing(std::move(block)));
    }

    std::function<void()> finishing(std::function<void()> block) {
        return [group = done, block = std::move(block)] {
            block();
            group->leave();
        };
    }

    std::shared_ptr<platform::WorkGroup> enteredGroup() {
        auto group = queues.createGroup();
        group->enter();
        return group;
    }

    Backend backend;
    platform::DispatchQueues& queues = backend.dispatchQueues;
    const std::shared_ptr<platform::WorkGroup> done = queues.createGroup();
    std::vector<int> numbers; // of the blocks of one serial queue, as they ran
};

TYPED_TEST_SUITE(DispatchQueueContract, TimeBackends, TimeBackendNames);

TYPED_TEST(DispatchQueueContract, ASerialQueueRunsItsBlocksInTheOrderOfTheCalls) {
    const auto queue = this->queues.createSerial("serial");
    std::vector<int> expected;
    for (int number = 0; number < 1000; ++number) {
        expected.push_back(number);
        this->post(*queue, [this, number] { this->numbers.push_back(number); });
    }
    EXPECT_TRUE(this->done->wait(tooLong));
    EXPECT_EQ(this->numbers, expected);
}

TYPED_TEST(DispatchQueueContract, ASerialQueueRunsOneBlockAtATimeAndKeepsEachPostersOrderUnderLoad) {
    const auto queue = this->queues.createSerial("serial");
    std::atomic<int> running = 0;
    std::atomic<int> overlaps = 0;
    std::vector<int> last(4, -1);
    std::vector<int> disorders(4, 0);
    for (std::size_t poster = 0; poster < 4; ++poster) {
        this->post(this->queues.global(), [&, poster] {
            for (int number = 0; number < 250; ++number) {
                this->post(*queue, [&, poster, number] {
                    overlaps += ++running > 1;
                    disorders[poster] += number != last[poster] + 1;
                    last[poster] = number;
                    --running;
                });
            }
        });
    }
    EXPECT_TRUE(this->done->wait(tooLong));
    EXPECT_EQ(overlaps, 0);
    EXPECT_EQ(disorders, (std::vector<int>(4, 0)));
    EXPECT_EQ(last, (std::vector<int>(4, 249)));
}

TYPED_TEST(DispatchQueueContract, ABlockThatWaitsHoldsUpTheRestOfItsSerialQueue) {
    const auto queue = this->queues.createSerial("serial");
    const auto gate = this->enteredGroup();
    this->post(*queue, [&] {
        gate->wait(tooLong);
        this->numbers.push_back(1);
    });
    this->post(*queue, [&] { this->numbers.push_back(2); });
    this->postAfter(this->queues.global(), 20ms, [gate] { gate->leave(); });
    EXPECT_TRUE(this->done->wait(tooLong));
    EXPECT_EQ(this->numbers, (std::vector<int>{1, 2}));
}

TYPED_TEST(DispatchQueueContract, EveryQueueMakesProgressWhileFiftyOthersBlock) {
    const auto gate = this->enteredGroup();
    std::vector<std::shared_ptr<platform::DispatchQueue>> serialQueues;
    std::atomic<int> opened = 0;
    for (int number = 0; number < 50; ++number) {
        serialQueues.push_back(this->queues.createSerial("blocked"));
        this->post(*serialQueues.back(), [&] { opened += gate->wait(tooLong); });
    }
    serialQueues.push_back(this->queues.createSerial("free"));
    this->post(*serialQueues.back(), [&] { gate->leave(); });
    EXPECT_TRUE(this->done->wait(tooLong));
    EXPECT_EQ(opened, 50);
}

TYPED_TEST(DispatchQueueContract, TheGlobalQueueRunsBlocksBesideEachOther) {
    const auto first = this->enteredGroup();
    const auto second = this->enteredGroup();
    std::atomic<int> met = 0;
    this->post(this->queues.global(), [&] {
        first->leave();
        met += second->wait(tooLong);
    });
    this->post(this->queues.global(), [&] {
        second->leave();
        met += first->wait(tooLong);
    });
    EXPECT_TRUE(this->done->wait(tooLong));
    EXPECT_EQ(met, 2);
}

TYPED_TEST(DispatchQueueContract, NeverRunsABlockBeforeItsDelayIsOver) {
    const auto posted = this->backend.clock.now();
    std::chrono::nanoseconds ran{};
    this->postAfter(this->queues.global(), 30ms, [&] { ran = this->backend.clock.now(); });
    EXPECT_TRUE(this->done->wait(tooLong));
    EXPECT_GE(ran - posted, 30ms);
}

TYPED_TEST(DispatchQueueContract, RunsDelayedBlocksOfASerialQueueAsTheirDelaysEnd) {
    const auto queue = this->queues.createSerial("serial");
    this->postAfter(*queue, 60ms, [&] { this->numbers.push_back(60); });
    this->postAfter(*queue, 20ms, [&] { this->numbers.push_back(20); });
    this->postAfter(*queue, 40ms, [&] { this->numbers.push_back(40); });
    EXPECT_TRUE(this->done->wait(tooLong));
    EXPECT_EQ(this->numbers, (std::vector<int>{20, 40, 60}));
}

TYPED_TEST(DispatchQueueContract, RunsABlockAtOnceForADelayOfNothingOrLess) {
    const auto queue = this->queues.createSerial("serial");
    this->postAfter(*queue, 0ns, [&] { this->numbers.push_back(0); });
    this->postAfter(*queue, -1h, [&] { this->numbers.push_back(1); });
    this->postAfter(*queue, std::chrono::nanoseconds::min(), [&] { this->numbers.push_back(2); });
    const auto before = this->backend.clock.now();
    EXPECT_TRUE(this->done->wait(2 * tooLong));
    EXPECT_LT(this->backend.clock.now() - before, tooLong);
    EXPECT_EQ(this->numbers, (std::vector<int>{0, 1, 2}));
}

TYPED_TEST(DispatchQueueContract, ADelayThatNoClockReachesNeverEndsAndHoldsUpNobody) {
    std::atomic<bool> ran = false;
    this->queues.global().asyncAfter(std::chrono::nanoseconds::max(), [&] { ran = true; });
    this->queues.global().asyncAfter(std::chrono::nanoseconds::max() - 1ns, [&] { ran = true; });
    this->postAfter(this->queues.global(), 10ms, [] {});
    EXPECT_TRUE(this->done->wait(tooLong));
    EXPECT_FALSE(ran);
}

TYPED_TEST(DispatchQueueContract, AQueueThatIsReleasedStillRunsWhatItWasGiven) {
    this->post(*this->queues.createSerial("released"), [&] { this->numbers.push_back(1); });
    this->postAfter(*this->queues.createSerial("released"), 10ms, [] {});
    EXPECT_TRUE(this->done->wait(tooLong));
    EXPECT_EQ(this->numbers, std::vector<int>{1});
}

TYPED_TEST(DispatchQueueContract, ABlockMayPostToItsOwnQueue) {
    const auto queue = this->queues.createSerial("serial");
    this->post(*queue, [&] {
        this->post(*queue, [&] { this->numbers.push_back(2); });
        this->numbers.push_back(1);
    });
    EXPECT_TRUE(this->done->wait(tooLong));
    EXPECT_EQ(this->numbers, (std::vector<int>{1, 2}));
}

TYPED_TEST(DispatchQueueContract, QueuesOfOneNameAreDistinct) {
    const auto first = this->queues.createSerial("same");
    const auto second = this->queues.createSerial("same");
    const auto gate = this->enteredGroup();
    bool opened = false;
    this->post(*first, [&] { opened = gate->wait(tooLong); });
    this->post(*second, [&] { gate->leave(); });
    EXPECT_TRUE(this->done->wait(tooLong));
    EXPECT_TRUE(opened);
}

TYPED_TEST(DispatchQueueContract, ReleasesABlockOnceItHasRun) {
    const auto held = std::make_shared<int>(0);
    const auto queue = this->queues.createSerial("serial");
    this->post(*queue, [held] {});
    this->post(*queue, [] {}); // runs after the first is released
    EXPECT_TRUE(this->done->wait(tooLong));
    EXPECT_EQ(held.use_count(), 1);
}

} // namespace
} // namespace welcomer::contract
