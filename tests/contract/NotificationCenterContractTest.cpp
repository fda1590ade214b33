// What every notification centre must do.

#include "backends/local/LocalNotificationCenter.h"
#include "tests/fakes/FakeNotificationCenter.h"

#include <gtest/gtest.h>

#include <atomic>
#include <memory>
#include <string>
#include <thread>
#include <vector>

namespace welcomer::contract {
namespace {

using Names = std::vector<std::string>;
using platform::Notification;

struct BackendNames {
    template <typename Backend>
    static std::string GetName(int) {
        return std::is_same_v<Backend, local::LocalNotificationCenter> ? "Local" : "Fake";
    }
};

template <typename Backend>
class NotificationCenterContract : public testing::Test {
  protected:
    // An observer that notes its own name.
    platform::NotificationCenter::Observer note(const std::string& name) {
        return [this, name](const Notification&) {
            names.push_back(name);
        };
    }

    Backend center;
    Names names;
};

using Backends = testing::Types<local::LocalNotificationCenter, fakes::FakeNotificationCenter>;
TYPED_TEST_SUITE(NotificationCenterContract, Backends, BackendNames);

TYPED_TEST(NotificationCenterContract, AnObserverGetsTheWholeNotificationFromAnySender) {
    std::vector<Notification> got;
    const auto observation =
        this->center.addObserver("a", [&](const Notification& notification) { got.push_back(notification); });
    this->center.post({"a", this, {{"key", 1}}});
    this->center.post({"a", nullptr, {}});
    ASSERT_EQ(got.size(), 2U);
    EXPECT_EQ(got[0].name, "a");
    EXPECT_EQ(got[0].sender, this);
    EXPECT_EQ(got[0].contents, (PropertyList::Dictionary{{"key", 1}}));
    EXPECT_EQ(got[1].sender, nullptr);
}

TYPED_TEST(NotificationCenterContract, OtherNamesAreNotObserved) {
    const auto observation = this->center.addObserver("a", this->note("a"));
    this->center.post({"b", nullptr, {}});
    this->center.post({"A", nullptr, {}});
    EXPECT_EQ(this->names, Names{});
}

TYPED_TEST(NotificationCenterContract, PostingWithoutObserversDoesNothing) {
    this->center.post({"a", nullptr, {}});
    EXPECT_EQ(this->names, Names{});
}

TYPED_TEST(NotificationCenterContract, ObserversAreCalledInTheOrderInWhichTheyWereAdded) {
    const auto first = this->center.addObserver("a", this->note("first"));
    const auto other = this->center.addObserver("b", this->note("other"));
    const auto second = this->center.addObserver("a", this->note("second"));
    this->center.post({"a", nullptr, {}});
    EXPECT_EQ(this->names, (Names{"first", "second"}));
}

TYPED_TEST(NotificationCenterContract, ARemovedObserverIsCalledNoMore) {
    auto observation = this->center.addObserver("a", this->note("a"));
    this->center.post({"a", nullptr, {}});
    observation.reset();
    this->center.post({"a", nullptr, {}});
    EXPECT_EQ(this->names, Names{"a"});
}

TYPED_TEST(NotificationCenterContract, AnObserverThatIsRemovedBeforeItsTurnIsNotCalled) {
    std::unique_ptr<platform::NotificationObservation> second;
    const auto first = this->center.addObserver("a", [&](const Notification&) { second.reset(); });
    second = this->center.addObserver("a", this->note("second"));
    const auto third = this->center.addObserver("a", this->note("third"));
    this->center.post({"a", nullptr, {}});
    EXPECT_EQ(this->names, Names{"third"});
}

TYPED_TEST(NotificationCenterContract, AnObserverMayRemoveItselfWithinItsCall) {
    std::unique_ptr<platform::NotificationObservation> own;
    const auto kept = std::make_shared<int>(0);
    own = this->center.addObserver("a", [&, kept](const Notification&) {
        own.reset();
        ++*kept; // what the observer holds is still there
    });
    this->center.post({"a", nullptr, {}});
    this->center.post({"a", nullptr, {}});
    EXPECT_EQ(*kept, 1);
    EXPECT_EQ(kept.use_count(), 1);
}

TYPED_TEST(NotificationCenterContract, AnObserverThatIsAddedMeanwhileWaitsForTheNextNotification) {
    std::vector<std::unique_ptr<platform::NotificationObservation>> added;
    const auto first = this->center.addObserver(
        "a", [&](const Notification&) { added.push_back(this->center.addObserver("a", this->note("new"))); });
    this->center.post({"a", nullptr, {}});
    EXPECT_EQ(this->names, Names{});
    this->center.post({"a", nullptr, {}});
    EXPECT_EQ(this->names, Names{"new"});
}

TYPED_TEST(NotificationCenterContract, AnObserverMayPost) {
    const auto first = this->center.addObserver("a", [&](const Notification&) {
        this->center.post({"b", nullptr, {}});
    });
    const auto second = this->center.addObserver("b", this->note("b"));
    this->center.post({"a", nullptr, {}});
    EXPECT_EQ(this->names, Names{"b"});
}

TYPED_TEST(NotificationCenterContract, ObserversAreCalledOnThePostingThread) {
    std::thread::id thread;
    const auto observation =
        this->center.addObserver("a", [&](const Notification&) { thread = std::this_thread::get_id(); });
    this->center.post({"a", nullptr, {}});
    EXPECT_EQ(thread, std::this_thread::get_id());
}

TEST(LocalNotificationCenterTest, ManyThreadsMayAddPostAndRemoveAtOnce) {
    local::LocalNotificationCenter center;
    std::atomic<int> calls = 0;
    std::vector<std::thread> threads;
    for (int i = 0; i < 4; ++i) {
        threads.emplace_back([&] {
            for (int round = 0; round < 500; ++round) {
                const auto observation = center.addObserver("a", [&](const Notification&) { ++calls; });
                center.post({"a", nullptr, {}});
            }
        });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    EXPECT_GE(calls, 2000); // each at least by its own post
    const int before = calls;
    center.post({"a", nullptr, {}});
    EXPECT_EQ(calls, before);
}

TEST(LocalNotificationCenterTest, AnObservationMayOutliveTheCentre) {
    std::unique_ptr<platform::NotificationObservation> observation;
    {
        local::LocalNotificationCenter center;
        observation = center.addObserver("a", [](const Notification&) {});
    }
    observation.reset();
    SUCCEED(); // the sanitizers would object
}

} // namespace
} // namespace welcomer::contract
