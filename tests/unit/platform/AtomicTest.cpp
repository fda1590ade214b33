#include "platform/Atomic.h"

#include <gtest/gtest.h>

#include <string>
#include <thread>

namespace welcomer::platform {
namespace {

TEST(Atomic, BeginsWithTheTypesOwnBeginningOrAGivenValue) {
    EXPECT_EQ(Atomic<int>().get(), 0);
    EXPECT_EQ(Atomic<std::string>("text").get(), "text");
}

TEST(Atomic, HoldsItsOwnCopy) {
    std::string value = "before";
    Atomic<std::string> atomic;
    atomic.set(value);
    value = "after";
    EXPECT_EQ(atomic.get(), "before");
}

TEST(Atomic, AReaderNeverSeesHalfAValue) {
    const std::string zeros(100, '0');
    const std::string ones(200, '1');
    Atomic<std::string> atomic(zeros);
    std::thread writer([&] {
        for (int round = 0; round < 20'000; ++round) {
            atomic.set(round % 2 == 0 ? ones : zeros);
        }
    });
    for (int round = 0; round < 20'000; ++round) {
        const std::string seen = atomic.get();
        ASSERT_TRUE(seen == zeros || seen == ones);
    }
    writer.join();
}

} // namespace
} // namespace welcomer::platform
