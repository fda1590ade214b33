#include "platform/Observable.h"

#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

namespace welcomer::platform {
namespace {

// Two stored values, and their sum as a derived one.
class Sums final : public Observable {
  public:
    void setLeft(int value) {
        change("left", [&] { left = value; });
    }
    void setRight(int value) {
        change("right", [&] { right = value; });
    }

    int left = 0;
    int right = 0;

  private:
    std::vector<std::string> keysAffecting(std::string_view derivedKey) const override {
        return derivedKey == "sum" ? std::vector<std::string>{"left", "right"} : std::vector<std::string>();
    }
};

class ObservableTest : public testing::Test {
  protected:
    Observable::Observation watch(const std::string& key, const std::string& name) {
        return sums->observe(
            key, [=, this] { calls.push_back(name + " before " + std::to_string(sums->left)); },
            [=, this] { calls.push_back(name + " after " + std::to_string(sums->left)); });
    }

    std::unique_ptr<Sums> sums = std::make_unique<Sums>();
    std::vector<std::string> calls;
};

TEST_F(ObservableTest, CallsBeforeAndAfterEachChange) {
    const auto observation = watch("left", "a");
    sums->setLeft(1);
    sums->setLeft(1);
    EXPECT_EQ(calls, (std::vector<std::string>{"a before 0", "a after 1", "a before 1", "a after 1"}));
}

TEST_F(ObservableTest, CallsInTheOrderOfRegistration) {
    const auto first = watch("left", "a");
    const auto second = watch("left", "b");
    sums->setLeft(1);
    EXPECT_EQ(calls, (std::vector<std::string>{"a before 0", "b before 0", "a after 1", "b after 1"}));
}

TEST_F(ObservableTest, LeavesOtherKeysAlone) {
    const auto observation = watch("right", "a");
    sums->setLeft(1);
    EXPECT_TRUE(calls.empty());
}

TEST_F(ObservableTest, ADerivedKeyChangesWithTheKeysThatItDeclares) {
    const auto observation = watch("sum", "a");
    sums->setLeft(1);
    sums->setRight(1);
    EXPECT_EQ(calls, (std::vector<std::string>{"a before 0", "a after 1", "a before 1", "a after 1"}));
}

TEST_F(ObservableTest, ObservingEndsWithTheObservation) {
    auto observation = watch("left", "a");
    observation.reset();
    sums->setLeft(1);
    EXPECT_TRUE(calls.empty());
}

TEST_F(ObservableTest, AnObservationMayOutliveItsObject) {
    const auto observation = watch("left", "a");
    sums.reset();
    EXPECT_TRUE(calls.empty());
}

TEST_F(ObservableTest, EitherCallbackMayBeEmpty) {
    int after = 0;
    const auto first = sums->observe("left", {}, [&] { ++after; });
    const auto second = sums->observe("left", {}, {});
    sums->setLeft(1);
    EXPECT_EQ(after, 1);
}

TEST_F(ObservableTest, ACallbackMayEndItsOwnObservationAndRegisterAnother) {
    Observable::Observation own;
    Observable::Observation other;
    own = sums->observe(
        "left",
        [&] {
            own.reset();
            other = watch("left", "other");
        },
        [&] { calls.emplace_back("own after"); });
    sums->setLeft(1);
    EXPECT_EQ(calls, (std::vector<std::string>{"own after"}));
    sums->setLeft(2);
    EXPECT_EQ(calls, (std::vector<std::string>{"own after", "other before 1", "other after 2"}));
}

} // namespace
} // namespace welcomer::platform
