// The connection to the store, and waiting for its set.

#include "log/PCLogManager.h"
#include "tests/unit/network/NetworkingManagerFixture.h"

namespace welcomer {
namespace {

using namespace std::chrono_literals;
using platform::NetworkDomain;
using platform::NetworkEntity;

// The connection to the store

TEST_F(NetworkingManagerTest, TheConnectionIsOpenedOnceUnderItsName) {
    manager.emplace();
    EXPECT_EQ(storeCalls(), Lines());
    const auto preferences = manager->systemPreferences();
    EXPECT_EQ(manager->systemPreferences(), preferences);
    EXPECT_EQ(storeCalls(),
              (Lines{"NetworkConfigStore.open com.corvid.FirstRun", "NetworkConfigStore.establish"}));
}

TEST_F(NetworkingManagerTest, NothingNewIsLoggedWithTheStoresLastErrorAlsoWhenThereIsNone) {
    manager.emplace();
    logged();
    manager->systemPreferences();
    EXPECT_EQ(logged(), (Lines{"NCNetworkSetEstablishDefaultConfiguration returned 0 error text of 0"}));

    store.failures["establish"] = {-12};
    manager.emplace();
    logged();
    manager->systemPreferences();
    EXPECT_EQ(logged(), (Lines{"NCNetworkSetEstablishDefaultConfiguration returned -12 error text of -12"}));
}

TEST_F(NetworkingManagerTest, NewHardwareIsStoredAndApplied) {
    store.newHardware = {service("new", "eth0")};
    manager.emplace();
    logged();
    manager->systemPreferences();
    EXPECT_EQ(storeCalls(),
              (Lines{"NetworkConfigStore.open com.corvid.FirstRun", "NetworkConfigStore.establish",
                     "NetworkConfigStore.commit", "NetworkConfigStore.apply"}));
    EXPECT_EQ(logged(), (Lines{"updated network configuration"}));
    EXPECT_EQ(store.stored.size(), 1U);
}

TEST_F(NetworkingManagerTest, ACommitOfNewHardwareThatFailsIsUndoneAndEndsIt) {
    store.newHardware = {service("new", "eth0")};
    store.failures["commit"] = {7};
    manager.emplace();
    logged();
    EXPECT_NE(manager->systemPreferences(), nullptr);
    EXPECT_EQ(storeCalls(),
              (Lines{"NetworkConfigStore.open com.corvid.FirstRun", "NetworkConfigStore.establish",
                     "NetworkConfigStore.commit", "NetworkConfigStore.synchronize"}));
    EXPECT_EQ(logged(), (Lines{"NCPreferencesCommitChanges failed error code 7 error text of 7"}));
    EXPECT_EQ(fake.recorder.calls().back(), "NetworkConfigStore.synchronize"); // after its line
}

TEST_F(NetworkingManagerTest, ACommitThatFailsWithoutACodeIsUndoneAndFollowedByTheApply) {
    store.newHardware = {service("new", "eth0")};
    store.failures["commit"] = {0};
    manager.emplace();
    logged();
    manager->systemPreferences();
    EXPECT_EQ(storeCalls(), (Lines{"NetworkConfigStore.open com.corvid.FirstRun",
                                   "NetworkConfigStore.establish", "NetworkConfigStore.commit",
                                   "NetworkConfigStore.synchronize", "NetworkConfigStore.apply"}));
    EXPECT_EQ(logged(), (Lines{"NCPreferencesCommitChanges failed error code 0 error text of 0",
                               "updated network configuration"}));
}

TEST_F(NetworkingManagerTest, AnApplyOfNewHardwareThatFailsEndsItUnlessItHasNoCode) {
    store.newHardware = {service("new", "eth0")};
    store.failures["apply"] = {7};
    manager.emplace();
    logged();
    manager->systemPreferences();
    EXPECT_EQ(logged(), (Lines{"NCPreferencesApplyChanges failed error code 7 error text of 7"}));

    store.newHardware = {service("newer", "eth1")};
    store.failures["apply"] = {0};
    manager.emplace();
    logged();
    manager->systemPreferences();
    EXPECT_EQ(logged(), (Lines{"NCPreferencesApplyChanges failed error code 0 error text of 0",
                               "updated network configuration"}));
}

TEST_F(NetworkingManagerTest, AMachineWithoutPortsAndSetIsNotWaitedFor) {
    store.hasSet = false;
    manager.emplace();
    logged();
    EXPECT_NE(manager->systemPreferences(), nullptr);
    EXPECT_EQ(storeCalls(),
              (Lines{"NetworkConfigStore.open com.corvid.FirstRun", "NetworkConfigStore.copyInterfaces"}));
    EXPECT_EQ(logged(), Lines());
    EXPECT_EQ(sleeps(), 0U);
}

TEST_F(NetworkingManagerTest, APortThatIsNeverListedIsNotWaitedForEither) {
    store.hasSet = false;
    store.interfaces = {{{"Modem", "Bluetooth-Modem", "Modem"}}};
    manager.emplace();
    manager->systemPreferences();
    EXPECT_EQ(sleeps(), 0U);
}

TEST_F(NetworkingManagerTest, ASetIsWaitedForSecondBySecondWithAFreshConnectionEachTime) {
    store.interfaces = {{{}}};
    store.setAppearsAfterOpening = 3;
    manager.emplace();
    logged();
    manager->systemPreferences();
    EXPECT_EQ(logged(), (Lines{"waiting for network configuration to be established (1)",
                               "waiting for network configuration to be established (2)",
                               "NCNetworkSetEstablishDefaultConfiguration returned 0 error text of 0"}));
    EXPECT_EQ(storeCalls(),
              (Lines{"NetworkConfigStore.open com.corvid.FirstRun", "NetworkConfigStore.copyInterfaces",
                     "NetworkConfigStore.close", "NetworkConfigStore.open com.corvid.FirstRun",
                     "NetworkConfigStore.copyInterfaces", "NetworkConfigStore.close",
                     "NetworkConfigStore.open com.corvid.FirstRun", "NetworkConfigStore.establish"}));
    EXPECT_EQ(sleeps(), 2U);
}

TEST_F(NetworkingManagerTest, EachAttemptIsLoggedBeforeItsSecondAndKeepsTheLastConnectionForAsLong) {
    store.interfaces = {{{}}};
    store.setAppearsAfterOpening = 3;
    manager.emplace();
    std::vector<std::chrono::nanoseconds> loggedAt;
    PCLogManager::sharedManager().setObserver([&](const PCLogManager::Call& call) {
        if (call.message.starts_with("waiting")) {
            loggedAt.push_back(fake.virtualTime.now());
        }
    });
    std::size_t closedWithinTheSecond = 99;
    fake.virtualTime.global().asyncAfter(
        500ms, [&] { closedWithinTheSecond = fake.recorder.callsTo("NetworkConfigStore.close").size(); });
    manager->systemPreferences();
    PCLogManager::sharedManager().setObserver({});
    EXPECT_EQ(loggedAt, (std::vector<std::chrono::nanoseconds>{0s, 1s}));
    EXPECT_EQ(closedWithinTheSecond, 0U);
}

TEST_F(NetworkingManagerTest, TheWaitForASetEndsAfterSixtyOneAttemptsAndSixtySeconds) {
    store.interfaces = {{{}}};
    store.hasSet = false;
    manager.emplace();
    logged();
    EXPECT_NE(manager->systemPreferences(), nullptr);
    EXPECT_EQ(store.opened, 61);
    EXPECT_EQ(sleeps(), 60U);
    const Lines lines = logged();
    ASSERT_EQ(lines.size(), 60U);
    EXPECT_EQ(lines.back(), "waiting for network configuration to be established (60)");
    EXPECT_EQ(manager->systemPreferences()->copyCurrentSet(), nullptr); // no second wait
    EXPECT_EQ(store.opened, 61);
}

} // namespace
} // namespace welcomer
