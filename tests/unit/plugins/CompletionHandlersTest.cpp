#include "plugins/CompletionHandlers.h"

#include "tests/support/Processors.h"

#include <atomic>
#include <gtest/gtest.h>
#include <memory>
#include <set>
#include <stdexcept>
#include <thread>
#include <vector>

namespace welcomer {
namespace {

struct Received {
    int calls = 0;
    bool succeeded = false;
    std::optional<platform::Error> error;
};

wl_completion_handler issueFor(Received& received) {
    return issueCompletionHandler([&](bool succeeded, const std::optional<platform::Error>& error) {
        ++received.calls;
        received.succeeded = succeeded;
        received.error = error;
    });
}

TEST(CompletionHandlers, PassSuccessWithoutAnError) {
    Received received;
    const auto handler = issueFor(received);
    handler.call(handler.context, true, 0, nullptr);
    EXPECT_EQ(received.calls, 1);
    EXPECT_TRUE(received.succeeded);
    EXPECT_FALSE(received.error);
}

TEST(CompletionHandlers, PassAFailureWithItsError) {
    Received received;
    const auto handler = issueFor(received);
    handler.call(handler.context, false, 5, "went wrong");
    EXPECT_FALSE(received.succeeded);
    EXPECT_EQ(received.error, (platform::Error{5, "went wrong"}));
}

TEST(CompletionHandlers, PassAFailureWithoutAnErrorObject) {
    Received received;
    const auto handler = issueFor(received);
    handler.call(handler.context, false, 5, nullptr);
    EXPECT_EQ(received.calls, 1);
    EXPECT_FALSE(received.succeeded);
    EXPECT_FALSE(received.error);
}

TEST(CompletionHandlers, TakeAnErrorTextThatIsNoUtf8) {
    Received received;
    const auto handler = issueFor(received);
    handler.call(handler.context, false, 0, "bad \xFF");
    EXPECT_EQ(received.error, (platform::Error{0, "bad \xEF\xBF\xBD"}));
}

TEST(CompletionHandlers, DoNothingWhenCalledAgain) {
    Received received;
    const auto handler = issueFor(received);
    handler.call(handler.context, true, 0, nullptr);
    handler.call(handler.context, false, 1, "again");
    EXPECT_EQ(received.calls, 1);
    EXPECT_TRUE(received.succeeded);
}

TEST(CompletionHandlers, DoNothingOnceRevoked) {
    Received received;
    const auto handler = issueFor(received);
    revokeCompletionHandler(handler);
    handler.call(handler.context, true, 0, nullptr);
    EXPECT_EQ(received.calls, 0);
}

TEST(CompletionHandlers, RevokedAfterTheirCallDoNothingMore) {
    Received received;
    const auto handler = issueFor(received);
    handler.call(handler.context, true, 0, nullptr);
    revokeCompletionHandler(handler);
    EXPECT_EQ(received.calls, 1);
}

TEST(CompletionHandlers, AreKeptApart) {
    Received first;
    Received second;
    const auto firstHandler = issueFor(first);
    const auto secondHandler = issueFor(second);
    secondHandler.call(secondHandler.context, true, 0, nullptr);
    EXPECT_EQ(first.calls, 0);
    EXPECT_EQ(second.calls, 1);
    firstHandler.call(firstHandler.context, true, 0, nullptr);
    EXPECT_EQ(first.calls, 1);
}

TEST(CompletionHandlers, DoNothingForAContextThatWasNeverIssued) {
    Received received;
    const auto handler = issueFor(received);
    handler.call(handler.context + 1000, true, 0, nullptr);
    EXPECT_EQ(received.calls, 0);
}

TEST(CompletionHandlers, HaveContextsThatNobodyCanGuess) {
    constexpr int kHandlers = 100;
    constexpr std::uint64_t kGuesses = 1000;
    std::vector<Received> received(kHandlers);
    std::vector<wl_completion_handler> handlers;
    std::set<std::uint64_t> upperHalves;
    for (Received& each : received) {
        handlers.push_back(issueFor(each));
        upperHalves.insert(handlers.back().context >> 32);
    }
    EXPECT_GT(upperHalves.size(), kHandlers / 2);
    // What a plug-in would try: small numbers, and the neighbours of its own.
    const wl_completion_handler own = handlers.back();
    for (std::uint64_t guess = 1; guess <= kGuesses; ++guess) {
        for (const std::uint64_t context : {guess, own.context - guess, own.context + guess}) {
            own.call(context, true, 0, nullptr);
        }
    }
    for (const Received& each : received) {
        EXPECT_EQ(each.calls, 0);
    }
    own.call(own.context, true, 0, nullptr);
    EXPECT_EQ(received.back().calls, 1);
    for (const wl_completion_handler& handler : handlers) {
        revokeCompletionHandler(handler);
    }
}

TEST(CompletionHandlers, KeepNothingAliveOnceSpent) {
    const auto kept = std::make_shared<int>(1);
    const auto called = issueCompletionHandler([kept](bool, const auto&) {});
    const auto revoked = issueCompletionHandler([kept](bool, const auto&) {});
    EXPECT_EQ(kept.use_count(), 3);
    called.call(called.context, true, 0, nullptr);
    revokeCompletionHandler(revoked);
    EXPECT_EQ(kept.use_count(), 1);
}

TEST(CompletionHandlers, LetNoExceptionIntoThePlugin) {
    const auto handler =
        issueCompletionHandler([](bool, const auto&) { throw std::runtime_error("of the host's own"); });
    EXPECT_NO_THROW(handler.call(handler.context, true, 0, nullptr));
}

TEST(CompletionHandlers, MayIssueAndCallOthersFromWithin) {
    Received inner;
    const auto outer = issueCompletionHandler([&](bool, const auto&) {
        const auto handler = issueFor(inner);
        handler.call(handler.context, true, 0, nullptr);
    });
    outer.call(outer.context, true, 0, nullptr);
    EXPECT_EQ(inner.calls, 1);
}

TEST(CompletionHandlers, CountOneCallWhenManyThreadsCallAtOnce) {
    std::atomic<int> calls = 0;
    const auto handler = issueCompletionHandler([&](bool, const auto&) { ++calls; });
    std::vector<std::thread> threads;
    for (int i = 0; i < 8; ++i) {
        threads.emplace_back([&] { handler.call(handler.context, true, 0, nullptr); });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    EXPECT_EQ(calls, 1);
}

TEST(CompletionHandlers, AreIssuedAndCalledByThreadsAtOnce) {
    constexpr int kRounds = 20'000;
    std::atomic<int> calls = 0;
    runOnTwoProcessors([&](MeetingPoint&) {
        for (int round = 0; round < kRounds; ++round) {
            const auto handler = issueCompletionHandler([&](bool, const auto&) { ++calls; });
            handler.call(handler.context, true, 0, nullptr);
        }
    });
    EXPECT_EQ(calls, 2 * kRounds);
}

} // namespace
} // namespace welcomer
