#include "tests/contract/TimeBackends.h"

#include <memory>

namespace welcomer::contract {
namespace {

using namespace std::chrono_literals;

template <typename Backend>
class WorkGroupContract : public testing::Test {
  protected:
    // Leaves the group after a while, beside this thread.
    void leaveAfter(std::chrono::nanoseconds delay) {
        backend.dispatchQueues.global().asyncAfter(delay, [group = group] { group->leave(); });
    }

    Backend backend;
    const std::shared_ptr<platform::WorkGroup> group = backend.dispatchQueues.createGroup();
};

TYPED_TEST_SUITE(WorkGroupContract, TimeBackends, TimeBackendNames);

TYPED_TEST(WorkGroupContract, IsEmptyAtFirst) {
    const auto before = this->backend.clock.now();
    EXPECT_TRUE(this->group->wait(0ns));
    EXPECT_TRUE(this->group->wait(tooLong));
    EXPECT_TRUE(this->group->wait(std::chrono::nanoseconds::max()));
    EXPECT_LT(this->backend.clock.now() - before, tooLong);
}

TYPED_TEST(WorkGroupContract, TimesOutNoEarlierThanAsked) {
    this->group->enter();
    const auto before = this->backend.clock.now();
    EXPECT_FALSE(this->group->wait(20ms));
    EXPECT_GE(this->backend.clock.now() - before, 20ms);
}

TYPED_TEST(WorkGroupContract, TimesOutAtOnceForNothingOrLess) {
    this->group->enter();
    EXPECT_FALSE(this->group->wait(0ns));
    EXPECT_FALSE(this->group->wait(-1s));
    EXPECT_FALSE(this->group->wait(std::chrono::nanoseconds::min()));
}

TYPED_TEST(WorkGroupContract, AWaitEndsWhenTheGroupIsLeft) {
    this->group->enter();
    const auto before = this->backend.clock.now();
    this->leaveAfter(20ms);
    EXPECT_TRUE(this->group->wait(tooLong));
    EXPECT_GE(this->backend.clock.now() - before, 20ms);
}

TYPED_TEST(WorkGroupContract, AWaitWithoutEndEndsWhenTheGroupIsLeft) {
    this->group->enter();
    this->leaveAfter(20ms);
    EXPECT_TRUE(this->group->wait(std::chrono::nanoseconds::max()));
}

TYPED_TEST(WorkGroupContract, EveryEnterNeedsALeave) {
    this->group->enter();
    this->group->enter();
    this->group->leave();
    EXPECT_FALSE(this->group->wait(1ms));
    this->group->leave();
    EXPECT_TRUE(this->group->wait(0ns));
}

TYPED_TEST(WorkGroupContract, MayBeEnteredAgainOnceEmpty) {
    this->group->enter();
    this->group->leave();
    EXPECT_TRUE(this->group->wait(0ns));
    this->group->enter();
    EXPECT_FALSE(this->group->wait(1ms));
}

TYPED_TEST(WorkGroupContract, ALeaveWithoutItsEnterDoesNothing) {
    this->group->leave();
    EXPECT_TRUE(this->group->wait(0ns));
    this->group->enter();
    EXPECT_FALSE(this->group->wait(1ms));
}

TYPED_TEST(WorkGroupContract, GroupsAreIndependent) {
    const auto other = this->backend.dispatchQueues.createGroup();
    other->enter();
    EXPECT_TRUE(this->group->wait(0ns));
    EXPECT_FALSE(other->wait(1ms));
}

TYPED_TEST(WorkGroupContract, AThousandLeavesFromQueuesEmptyIt) {
    for (int job = 0; job < 1000; ++job) {
        this->group->enter();
        this->backend.dispatchQueues.global().async([group = this->group] { group->leave(); });
    }
    EXPECT_TRUE(this->group->wait(tooLong));
}

} // namespace
} // namespace welcomer::contract
