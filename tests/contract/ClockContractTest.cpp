#include "tests/contract/TimeBackends.h"

namespace welcomer::contract {
namespace {

using namespace std::chrono_literals;

template <typename Backend>
class ClockContract : public testing::Test {
  protected:
    Backend backend;
    platform::Clock& clock = backend.clock;
};

TYPED_TEST_SUITE(ClockContract, TimeBackends, TimeBackendNames);

TYPED_TEST(ClockContract, NeverGoesBack) {
    auto last = this->clock.now();
    for (int reading = 0; reading < 1000; ++reading) {
        const auto now = this->clock.now();
        ASSERT_GE(now, last);
        last = now;
    }
}

TYPED_TEST(ClockContract, SleepsAtLeastAsLongAsAsked) {
    const auto before = this->clock.now();
    this->clock.sleep(20ms);
    EXPECT_GE(this->clock.now() - before, 20ms);
}

TYPED_TEST(ClockContract, SleepingForNothingOrLessReturnsAtOnce) {
    const auto before = this->clock.now();
    this->clock.sleep(0ns);
    this->clock.sleep(-1h);
    this->clock.sleep(std::chrono::nanoseconds::min());
    EXPECT_LT(this->clock.now() - before, tooLong);
}

} // namespace
} // namespace welcomer::contract
