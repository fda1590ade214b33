// Applying the user's settings: which services, how long, and with which result.

#include "tests/unit/network/NetworkingManagerApplyFixture.h"

#include <algorithm>
#include <cstdint>
#include <limits>

namespace welcomer {
namespace {

// The choice and the warning type

TEST_F(ApplyTest, WarningTypeZeroSucceedsAndWritesNothingEvenForTheLAN) {
    NetworkingManager& made = manualManager();
    EXPECT_TRUE(apply(made));
    EXPECT_EQ(error, untouched);
    EXPECT_EQ(storeCalls(), Lines());
    EXPECT_EQ(fake.hostReachability.probes, 0U);
}

TEST_F(ApplyTest, WarningTypeTwoFailsEvenThoughTheNetworkIsConfiguredAndReachable) {
    NetworkingManager& made = manualManager();
    made.setInternetConnectionWarningType(2);
    EXPECT_FALSE(apply(made));
    EXPECT_EQ(error, reachabilityError);
    EXPECT_EQ(stored(0, "IPv4").at("ConfigMethod"), PropertyList("Manual"));
    EXPECT_EQ(fake.hostReachability.probes, 0U);
}

TEST_F(ApplyTest, AnyOtherWarningTypeConfiguresAndProbesNothing) {
    for (const std::uint64_t type : {std::uint64_t{3}, std::numeric_limits<std::uint64_t>::max()}) {
        NetworkingManager& made = manualManager();
        made.setInternetConnectionWarningType(type);
        EXPECT_TRUE(apply(made));
        EXPECT_EQ(error, untouched);
        EXPECT_FALSE(store.stored.empty());
        EXPECT_EQ(fake.hostReachability.probes, 0U);
    }
}

TEST_F(ApplyTest, OnlyTheLANIsConfigured) {
    for (const char* choice : {"wifi", "no", "LAN", ""}) {
        NetworkingManager& made = manualManager();
        made.setUserChoice(choice);
        made.setInternetConnectionWarningType(3);
        EXPECT_TRUE(apply(made));
        EXPECT_EQ(storeCalls(), Lines());
    }
}

TEST_F(ApplyTest, AConfigurationThatFailsIsTheConfigurationErrorWithoutAProbe) {
    for (const std::uint64_t type : {1U, 2U, 3U}) {
        NetworkingManager& made = manualManager();
        made.setInternetConnectionWarningType(type);
        store.failures["commit"] = {7};
        EXPECT_FALSE(apply(made));
        EXPECT_EQ(error, configurationError);
        EXPECT_EQ(fake.hostReachability.probes, 0U);
        EXPECT_FALSE(made.applySettings(nullptr));
    }
}

TEST_F(ApplyTest, WhetherTheStoreRefusedIsSaidOfTheLastCallAlone) {
    NetworkingManager& made = manualManager();
    made.setInternetConnectionWarningType(3);
    EXPECT_FALSE(made.wasRefusedByStore());
    store.failures["apply"] = {7};
    EXPECT_FALSE(apply(made));
    EXPECT_TRUE(made.wasRefusedByStore());

    store.failures.clear();
    EXPECT_TRUE(apply(made));
    EXPECT_FALSE(made.wasRefusedByStore());

    store.failures["commit"] = {7};
    EXPECT_FALSE(apply(made));
    EXPECT_TRUE(made.wasRefusedByStore());
    store.failures.clear();
    made.setInternetConnectionWarningType(2); // fails always
    EXPECT_FALSE(apply(made));
    EXPECT_FALSE(made.wasRefusedByStore());

    store.failures["commit"] = {7};
    EXPECT_FALSE(apply(made));
    made.setIpAddress(std::nullopt); // what cannot be configured never comes to the store
    EXPECT_FALSE(apply(made));
    EXPECT_FALSE(made.wasRefusedByStore());
}

TEST_F(ApplyTest, ErrorTextsThatTheBundleLacksAreEmpty) {
    fake.resourceBundles.mainBundleTexts.clear();
    const Dictionary empty = {{"title", ""}, {"body", ""}};
    EXPECT_EQ(NetworkingManager::genericReachabilityErrorDict(), empty);
    EXPECT_EQ(NetworkingManager::genericConfigurationErrorDict(), empty);
    EXPECT_EQ(fake.recorder.callsTo("ResourceBundle.localizedString"),
              (Lines{"ResourceBundle.localizedString NETWORKING_MANAGER_NO_INTERNET_TITLE, ",
                     "ResourceBundle.localizedString NETWORKING_MANAGER_NO_INTERNET_BODY, ",
                     "ResourceBundle.localizedString NETWORKING_MANAGER_GENERIC_ERROR_TITLE, ",
                     "ResourceBundle.localizedString NETWORKING_MANAGER_GENERIC_ERROR_BODY, "}));
}

// The wait

TEST_F(ApplyTest, AWaitOfZeroIsOneProbeAndWhenItFailsOneSecond) {
    NetworkingManager& made = openManager();
    made.setInternetConnectionWarningType(1);
    fake.hostReachability.flags = 0U;
    EXPECT_FALSE(apply(made));
    EXPECT_EQ(error, reachabilityError);
    EXPECT_EQ(fake.hostReachability.probes, 1U);
    EXPECT_EQ(sleeps(), 1U);
    EXPECT_EQ(logged(), (Lines{"<NetworkingManager>: Internet is not reachable after 1 seconds"}));
}

TEST_F(ApplyTest, AFirstProbeThatSucceedsTakesNoTime) {
    NetworkingManager& made = openManager();
    made.setInternetConnectionWarningType(1);
    made.setSecondsToWaitForInternetReachability(10);
    EXPECT_TRUE(apply(made));
    EXPECT_EQ(fake.hostReachability.probes, 1U);
    EXPECT_EQ(sleeps(), 0U);
    EXPECT_EQ(logged(), (Lines{"<NetworkingManager>: Internet is reachable after 0 seconds"}));
}

TEST_F(ApplyTest, AWaitOfNIsAtMostOneProbeAndOneSecondMore) {
    for (const std::uint64_t failing : {0U, 1U, 9U, 10U, 11U, 500U}) {
        NetworkingManager& made = openManager();
        const std::size_t before = sleeps();
        made.setInternetConnectionWarningType(1);
        made.setSecondsToWaitForInternetReachability(10);
        fake.hostReachability.probes = 0;
        fake.hostReachability.failingProbes = failing;
        const bool succeeds = failing <= 10;
        EXPECT_EQ(apply(made), succeeds);
        EXPECT_EQ(fake.hostReachability.probes, std::min<std::uint64_t>(failing + 1, 11));
        EXPECT_EQ(sleeps() - before, std::min<std::uint64_t>(failing, 11));
        EXPECT_EQ(logged(), (Lines{std::string("<NetworkingManager>: Internet is ") +
                                   (succeeds ? "" : "not ") + "reachable after " +
                                   std::to_string(std::min<std::uint64_t>(failing, 11)) + " seconds"}));
    }
}

TEST_F(ApplyTest, ANegativeWaitGoesOnWithTheCounterWrappingAround) {
    for (const std::int64_t wait :
         {std::int64_t{-1}, std::int64_t{-7}, std::numeric_limits<std::int64_t>::min()}) {
        NetworkingManager& made = openManager();
        made.setInternetConnectionWarningType(1);
        made.setSecondsToWaitForInternetReachability(wait);
        fake.hostReachability.probes = 0;
        fake.hostReachability.failingProbes = 300;
        EXPECT_TRUE(apply(made));
        EXPECT_EQ(fake.hostReachability.probes, 301U);
        EXPECT_EQ(logged(), (Lines{"<NetworkingManager>: Internet is reachable after 300 seconds"}));
    }
}

// Configuring

TEST_F(ApplyTest, TheCabledServiceIsConfiguredThenEnabled) {
    NetworkingManager& made = manualManager();
    setLink("eth0", false);
    setLink("eth1", true);
    EXPECT_TRUE(made.configureManual());
    EXPECT_EQ(writes(), (Lines{"addProtocolType spare", "setConfiguration spare", "addProtocolType spare",
                               "commit", "apply", "setEnabled spare"}));
    EXPECT_EQ(stored(1, "IPv4"), (Dictionary{{"ConfigMethod", "Manual"},
                                             {"Addresses", Array{"192.0.2.7"}},
                                             {"SubnetMasks", Array{"255.255.255.0"}},
                                             {"Router", "192.0.2.1"}}));
    EXPECT_FALSE(store.stored[1].isEnabled); // enabled only after the commit
    EXPECT_TRUE(store.services[1].isEnabled);
}

TEST_F(ApplyTest, OfSeveralCabledServicesTheFirstAloneIsConfigured) {
    NetworkingManager& made = manualManager();
    setLink("eth1", true);
    EXPECT_TRUE(made.configureManual());
    EXPECT_TRUE(store.services[0].isEnabled);
    EXPECT_TRUE(store.services[1].protocols.empty());
}

TEST_F(ApplyTest, WithoutACableEveryEthernetServiceIsConfiguredThenEnabledInOrder) {
    NetworkingManager& made = manualManager();
    setLink("eth0", false);
    EXPECT_TRUE(made.configureManual());
    EXPECT_EQ(writes(),
              (Lines{"addProtocolType wired", "setConfiguration wired", "addProtocolType wired", "commit",
                     "apply", "setEnabled wired", "addProtocolType spare", "setConfiguration spare",
                     "addProtocolType spare", "commit", "apply", "setEnabled spare"}));
}

TEST_F(ApplyTest, WithoutACableTheLastServicesResultCounts) {
    NetworkingManager& made = manualManager();
    setLink("eth0", false);
    store.failures["apply"] = {7, 0, 1}; // the first one's
    EXPECT_TRUE(made.configureManual());
    store.failures["apply"] = {7, 1, 1}; // the last one's
    EXPECT_FALSE(made.configureManual());
}

TEST_F(ApplyTest, WithoutAnyEthernetServiceConfiguringFails) {
    store.services = {service("radio", "wlan0", "Wireless")};
    EXPECT_FALSE(manualManager().configureManual());
    store.hasSet = false;
    EXPECT_FALSE(manager->configureManual());
    EXPECT_EQ(storeCalls(), Lines());
    EXPECT_EQ(logged(), Lines());
}

TEST_F(ApplyTest, TheWirelessServiceIsEnabledThenConfigured) {
    NetworkingManager& made = manualManager();
    made.setUserChoice("wifi");
    EXPECT_TRUE(made.configureManual());
    EXPECT_EQ(writes(), (Lines{"setEnabled radio", "addProtocolType radio", "setConfiguration radio",
                               "addProtocolType radio", "commit", "apply"}));
    EXPECT_TRUE(store.stored[2].isEnabled);
}

TEST_F(ApplyTest, EveryChoiceButTheLANConfiguresTheWirelessService) {
    for (const char* choice : {"no", "LAN"}) {
        NetworkingManager& made = manualManager();
        made.setUserChoice(choice);
        EXPECT_TRUE(made.configureManual());
        EXPECT_EQ(fake.recorder.callsTo(kStore + "setEnabled"), (Lines{kStore + "setEnabled radio, yes"}));
    }
}

TEST_F(ApplyTest, AMissingWirelessServiceFailsWithoutWriting) {
    store.services.pop_back();
    NetworkingManager& made = manualManager();
    made.setUserChoice("wifi");
    EXPECT_FALSE(made.configureManual());
    EXPECT_EQ(storeCalls(), Lines());
}

TEST_F(ApplyTest, WhatTheStoreThrowsEndsItWithTheResultSoFar) {
    store.exceptions["setEnabled"] = "boom";
    EXPECT_TRUE(manualManager().configureManual()); // configured before it was to be enabled
    manager->setUserChoice("wifi");
    EXPECT_FALSE(manager->configureManual()); // not configured yet
    manager->setUserChoice("lan");
    setLink("eth0", false);
    fake.recorder.clear();
    EXPECT_TRUE(manager->configureManual()); // the first service's; the second is not reached
    EXPECT_EQ(fake.recorder.callsTo(kStore + "commit").size(), 1U);
}

TEST_F(ApplyTest, AServiceThatCannotBeEnabledChangesNoResult) {
    store.failures["setEnabled"] = {7};
    EXPECT_TRUE(manualManager().configureManual());
    EXPECT_EQ(logged(), Lines());
}

class KeylessManager final : public NetworkingManager {
    Text _hardwareKey() const override { return std::nullopt; }
};

TEST_F(ApplyTest, NoHardwareKeyIsTakenForEthernetByBothSteps) {
    KeylessManager keyless;
    keyless.systemPreferences();
    keyless.setConfigurationMethod("BootP");
    logged();
    EXPECT_TRUE(keyless.configureManual());
    EXPECT_EQ(logged(), (Lines{"NetworkingManager: no Connection specified, assuming Ethernet",
                               "NetworkingManager: no Connection specified, assuming Ethernet"}));
    EXPECT_TRUE(store.services[0].isEnabled);
}

TEST_F(ApplyTest, TheDebugDefaultLogsTheSettingsFirst) {
    NetworkingManager& made = manualManager();
    made.setDns(Lines{"192.0.2.53", "192.0.2.54"});
    fake.preferenceStore.store("com.corvid.welcomer", "WLNetworkingManagerDebug", true);
    made.configureManual();
    EXPECT_EQ(logged(), (Lines{"NetworkingManager: Configuring manual ethernet", "Method: Manual",
                               "IP:     192.0.2.7", "Subnet: 255.255.255.0", "Router: 192.0.2.1",
                               "DNS:    (192.0.2.53, 192.0.2.54)", "Search: (null)"}));
}

TEST_F(ApplyTest, WithoutTheDebugDefaultNothingIsLogged) {
    manualManager().configureManual();
    EXPECT_EQ(logged(), Lines());
}

// Registering

TEST_F(ApplyTest, RegisteringWithoutASetIsALogLine) {
    NetworkingManager& made = openManager();
    store.hasSet = false;
    made.registerNewNetworkServices();
    EXPECT_EQ(logged(), (Lines{"NCNetworkSetCopyCurrent failed"}));
    EXPECT_EQ(storeCalls(), Lines());
}

TEST_F(ApplyTest, RegisteringNothingNewIsALogLine) {
    NetworkingManager& made = openManager();
    made.registerNewNetworkServices();
    EXPECT_EQ(logged(), (Lines{"NCNetworkSetEstablishDefaultConfiguration : no new devices."}));
    EXPECT_EQ(writes(), (Lines{"establish"}));
}

TEST_F(ApplyTest, RegisteringNewHardwareStoresAndAppliesIt) {
    NetworkingManager& made = openManager();
    store.newHardware = {service("new", "eth7")};
    made.registerNewNetworkServices();
    EXPECT_EQ(logged(), (Lines{"updated network configuration"}));
    EXPECT_EQ(writes(), (Lines{"establish", "commit", "apply"}));
}

TEST_F(ApplyTest, RegisteringStopsAtAFailureWithACode) {
    for (const std::int32_t code : {0, 7}) {
        const std::string tail = std::to_string(code) + " error text of " + std::to_string(code);
        store.failures = {{"commit", {code}}};
        NetworkingManager& made = openManager();
        store.newHardware = {service("new", "eth7")};
        made.registerNewNetworkServices();
        EXPECT_EQ(made.wasRefusedByStore(), code != 0);
        Lines lines = {"NCPreferencesCommitChanges failed error code " + tail};
        Lines calls = {"establish", "commit", "synchronize"};
        if (code == 0) {
            lines.emplace_back("updated network configuration");
            calls.emplace_back("apply");
        }
        EXPECT_EQ(logged(), lines);
        EXPECT_EQ(writes(), calls);

        store.failures = {{"apply", {code}}};
        NetworkingManager& other = openManager();
        store.newHardware = {service("newer", "eth8")};
        other.registerNewNetworkServices();
        EXPECT_EQ(other.wasRefusedByStore(), code != 0);
        lines = {"NCPreferencesApplyChanges failed error code " + tail};
        if (code == 0) {
            lines.emplace_back("updated network configuration");
        }
        EXPECT_EQ(logged(), lines);
        EXPECT_EQ(writes(), (Lines{"establish", "commit", "apply"}));
    }
}

} // namespace
} // namespace welcomer
