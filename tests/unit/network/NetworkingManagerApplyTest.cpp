// Applying the user's settings.

#include "tests/unit/network/NetworkingManagerFixture.h"

#include <algorithm>
#include <cstdint>
#include <limits>
#include <ostream>
#include <utility>

namespace welcomer {
namespace {

const std::string kStore = "NetworkConfigStore.";

class ApplyTest : public NetworkingManagerTest {
  protected:
    ApplyTest() {
        fake.resourceBundles.mainBundleTexts = {{"NETWORKING_MANAGER_NO_INTERNET_TITLE", "No internet"},
                                                {"NETWORKING_MANAGER_NO_INTERNET_BODY", "Check the cable."},
                                                {"NETWORKING_MANAGER_GENERIC_ERROR_TITLE", "Not configured"},
                                                {"NETWORKING_MANAGER_GENERIC_ERROR_BODY", "Try again."}};
        store.services = {service("wired", "eth0"), service("spare", "eth1"),
                          service("radio", "wlan0", "Wireless")};
        setLink("eth0", true);
    }

    const Dictionary reachabilityError = {{"title", "No internet"}, {"body", "Check the cable."}};
    const Dictionary configurationError = {{"title", "Not configured"}, {"body", "Try again."}};

    // A manager with a manual configuration of the wired network.
    NetworkingManager& manualManager() {
        NetworkingManager& made = openManager();
        made.setUserChoice("lan");
        made.setConfigurationMethod("Manual");
        made.setIpAddress("192.0.2.7");
        made.setSubnetMask("255.255.255.0");
        made.setRouter("192.0.2.1");
        return made;
    }

    // Applies, with an error dictionary that is untouched on success.
    bool apply(NetworkingManager& made) {
        error = {{"untouched", true}};
        return made.applySettings(&error);
    }

    Dictionary stored(std::size_t index, const std::string& type) {
        const fakes::FakeProtocol* protocol =
            index < store.stored.size() ? store.stored[index].protocol(type) : nullptr;
        return protocol ? protocol->configuration.value_or(Dictionary{{"no", "configuration"}})
                        : Dictionary{{"no", "protocol"}};
    }

    // The calls that write, without their arguments.
    Lines writes() const {
        Lines found;
        for (const std::string& call : storeCalls()) {
            found.push_back(call.substr(kStore.size(), call.find(',') - kStore.size()));
        }
        return found;
    }

    Dictionary error;
    const Dictionary untouched = {{"untouched", true}};
};

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

// The IPv4 configuration

TEST_F(ApplyTest, EachMethodSetsItsOwnKeysAndLeavesTheOthersInPlace) {
    const Dictionary earlier = {{"ConfigMethod", "Manual"},
                                {"Addresses", Array{"10.0.0.1", "10.0.0.2"}},
                                {"SubnetMasks", Array{"255.0.0.0"}},
                                {"Router", "10.0.0.254"},
                                {"Other", 1}};
    const auto changed = [&](Dictionary changes) {
        Dictionary all = earlier;
        for (auto& [key, value] : changes) {
            all.insert_or_assign(key, value);
        }
        return all;
    };
    const std::vector<std::pair<std::string, Dictionary>> kCases = {
        {"Manual", changed({{"Addresses", Array{"192.0.2.7"}},
                            {"SubnetMasks", Array{"255.255.255.0"}},
                            {"Router", "192.0.2.1"}})},
        {"Manual DHCP", changed({{"ConfigMethod", "INFORM"}, {"Addresses", Array{"192.0.2.7"}}})},
        {"DHCP", changed({{"ConfigMethod", "DHCP"}, {"DHCPClientID", "me"}})},
        {"BootP", changed({{"ConfigMethod", "BOOTP"}})},
    };
    for (const auto& [method, expected] : kCases) {
        store.services[0].protocols = {{"IPv4", earlier}};
        NetworkingManager& made = manualManager();
        made.setDhcpClientID("me");
        made.setConfigurationMethod(method);
        EXPECT_TRUE(made.configureManual());
        EXPECT_EQ(stored(0, "IPv4"), expected) << method;
        EXPECT_EQ(logged(), Lines());
    }
}

TEST_F(ApplyTest, TheDHCPClientIDIsWrittenOnlyWhenItIsSet) {
    NetworkingManager& made = manualManager();
    made.setConfigurationMethod("DHCP");
    EXPECT_TRUE(made.configureManual());
    EXPECT_EQ(stored(0, "IPv4"), (Dictionary{{"ConfigMethod", "DHCP"}}));
    made.setDhcpClientID("");
    EXPECT_TRUE(made.configureManual());
    EXPECT_EQ(stored(0, "IPv4"), (Dictionary{{"ConfigMethod", "DHCP"}, {"DHCPClientID", ""}}));
}

TEST_F(ApplyTest, AnUnknownOrMissingMethodIsDHCPWithALogLine) {
    for (const NetworkingManager::Text& method :
         {NetworkingManager::Text(), NetworkingManager::Text("manual"), NetworkingManager::Text("INFORM"),
          NetworkingManager::Text("BOOTP"), NetworkingManager::Text("")}) {
        NetworkingManager& made = manualManager();
        made.setConfigurationMethod(method);
        EXPECT_TRUE(made.configureManual());
        EXPECT_EQ(logged(), (Lines{"NetworkingManager: no TCPConfigureMethod specified, assuming DHCP"}));
        EXPECT_EQ(stored(0, "IPv4"), (Dictionary{{"ConfigMethod", "DHCP"}}));
    }
}

TEST_F(ApplyTest, WhatIsStoredIsStoredAsItStands) {
    NetworkingManager& made = manualManager();
    made.setIpAddress("no address");
    made.setSubnetMask("255.0.255.0");
    made.setRouter("");
    EXPECT_TRUE(made.configureManual());
    EXPECT_EQ(stored(0, "IPv4"), (Dictionary{{"ConfigMethod", "Manual"},
                                             {"Addresses", Array{"no address"}},
                                             {"SubnetMasks", Array{"255.0.255.0"}},
                                             {"Router", ""}}));
}

TEST_F(ApplyTest, AManualSettingThatIsNoneFailsWithNothingCommitted) {
    for (int missing = 0; missing < 3; ++missing) {
        NetworkingManager& made = manualManager();
        missing == 0 ? made.setIpAddress(std::nullopt)
                     : (missing == 1 ? made.setSubnetMask(std::nullopt) : made.setRouter(std::nullopt));
        EXPECT_FALSE(made.configureManual());
        EXPECT_EQ(fake.recorder.callsTo(kStore + "setConfiguration"), Lines());
        EXPECT_EQ(fake.recorder.callsTo(kStore + "commit"), Lines());
    }
    NetworkingManager& made = manualManager();
    made.setConfigurationMethod("Manual DHCP");
    made.setIpAddress(std::nullopt);
    EXPECT_FALSE(made.configureManual());
    EXPECT_EQ(fake.recorder.callsTo(kStore + "commit"), Lines());
}

TEST_F(ApplyTest, AServiceWithoutAnIPv4OrADNSProtocolFailsWithNothingCommitted) {
    store.failures["addProtocolType"] = {7};
    EXPECT_FALSE(manualManager().configureManual());
    EXPECT_EQ(logged(), (Lines{"Error 7 from NCNetworkServiceAddProtocolType"}));
    EXPECT_EQ(fake.recorder.callsTo(kStore + "commit"), Lines());

    store.failures["addProtocolType"] = {0, 1}; // the DNS protocol
    EXPECT_FALSE(manualManager().configureManual());
    EXPECT_EQ(logged(), (Lines{"Error 0 from NCNetworkServiceAddProtocolType"}));
    EXPECT_EQ(fake.recorder.callsTo(kStore + "commit"), Lines());
}

TEST_F(ApplyTest, AConfigurationThatCannotBeSetIsLoggedAndTheRestFollows) {
    for (const std::int32_t code : {0, -7}) {
        store.failures["setConfiguration"] = {code, 0, 1};
        NetworkingManager& made = manualManager();
        made.setDns(Lines{"192.0.2.53"});
        EXPECT_TRUE(made.configureManual());
        EXPECT_EQ(logged(), (Lines{"NetworkingManager: NCNetworkProtocolSetConfiguration failed error code " +
                                   std::to_string(code) + " error text of " + std::to_string(code)}));
        EXPECT_EQ(stored(0, "DNS"), (Dictionary{{"ServerAddresses", Array{"192.0.2.53"}}}));
    }
}

// The DNS configuration

TEST_F(ApplyTest, LeadingSpacesGoTrailingOnesStayAndNoAddressIsDropped) {
    const std::vector<std::pair<Lines, Array>> kCases = {
        {{"  192.0.2.1", "0.0.0.0"}, {"192.0.2.1"}},
        {{"192.0.2.1  "}, {"192.0.2.1  "}},
        {{"", "   ", "192.0.2.1"}, {"192.0.2.1"}},
        {{" 0.0.0.0", "0.0.0.0 "}, {"0.0.0.0 "}},
        {{"\t192.0.2.1"}, {"\t192.0.2.1"}},
        {{"no address", "192.0.2.2", "192.0.2.2"}, {"no address", "192.0.2.2", "192.0.2.2"}},
    };
    for (const auto& [given, kept] : kCases) {
        NetworkingManager& made = manualManager();
        made.setDns(given);
        EXPECT_TRUE(made.configureManual());
        EXPECT_EQ(stored(0, "DNS"), (Dictionary{{"ServerAddresses", kept}}));
        EXPECT_EQ(logged(), Lines());
    }
}

TEST_F(ApplyTest, AnEntryThatIsNoTextIsLoggedAndSkipped) {
    NetworkingManager& made = manualManager();
    made.setDns(Lines{" \xff", "192.0.2.1"});
    EXPECT_TRUE(made.configureManual());
    EXPECT_EQ(stored(0, "DNS"), (Dictionary{{"ServerAddresses", Array{"192.0.2.1"}}}));
    EXPECT_EQ(logged(), (Lines{"*** _setManualDNS bad DNS  \xff"}));
}

TEST_F(ApplyTest, WithoutAServerTheDNSConfigurationIsLeftUntouched) {
    const Dictionary earlier = {{"ServerAddresses", Array{"198.51.100.1"}}};
    for (const NetworkingManager::TextList& given :
         {NetworkingManager::TextList(), NetworkingManager::TextList(Lines{}),
          NetworkingManager::TextList(Lines{" ", "0.0.0.0"})}) {
        store.services[0].protocols = {{"DNS", earlier}};
        NetworkingManager& made = manualManager();
        made.setDns(given);
        made.setSearchDomains(Lines{"home.example"});
        EXPECT_TRUE(made.configureManual());
        EXPECT_EQ(stored(0, "DNS"), earlier);
        EXPECT_EQ(fake.recorder.callsTo(kStore + "setConfiguration").size(), 1U); // the IPv4 one
    }
}

TEST_F(ApplyTest, SearchDomainsAreNeverWritten) {
    store.services[0].protocols = {{"DNS", Dictionary{{"DomainName", "kept.example"}}}};
    NetworkingManager& made = manualManager();
    made.setDns(Lines{"192.0.2.1"});
    made.setSearchDomains(Lines{"home.example"});
    EXPECT_TRUE(made.configureManual());
    EXPECT_EQ(stored(0, "DNS"),
              (Dictionary{{"DomainName", "kept.example"}, {"ServerAddresses", Array{"192.0.2.1"}}}));
}

TEST_F(ApplyTest, ADNSConfigurationThatCannotBeSetIsLoggedAndCommittedAllTheSame) {
    for (const std::int32_t code : {0, 7}) {
        store.failures["setConfiguration"] = {code, 1, 1};
        NetworkingManager& made = manualManager();
        made.setDns(Lines{"192.0.2.1"});
        EXPECT_TRUE(made.configureManual());
        EXPECT_EQ(logged(),
                  (Lines{"Error " + std::to_string(code) + " from NCNetworkProtocolSetConfiguration"}));
        EXPECT_EQ(fake.recorder.callsTo(kStore + "commit").size(), 1U);
    }
}

TEST_F(ApplyTest, TenThousandServersAreAllStored) {
    NetworkingManager& made = manualManager();
    made.setDns(Lines(10000, " 192.0.2.1"));
    EXPECT_TRUE(made.configureManual());
    EXPECT_EQ(stored(0, "DNS"), (Dictionary{{"ServerAddresses", Array(10000, "192.0.2.1")}}));
}

// Committing

TEST_F(ApplyTest, ACommitThatFailsIsUndoneAndNotApplied) {
    NetworkingManager& made = openManager();
    store.failures["commit"] = {-7};
    EXPECT_FALSE(made.commitPrefs());
    EXPECT_EQ(writes(), (Lines{"commit", "synchronize"}));
    EXPECT_EQ(logged(),
              (Lines{"NetworkingManager: NCPreferencesCommitChanges failed error code -7 error text of -7"}));
}

TEST_F(ApplyTest, ACommitThatFailsIsLoggedBeforeItIsUndone) {
    NetworkingManager& made = openManager();
    store.failures["commit"] = {-7};
    EXPECT_FALSE(made.commitPrefs());
    EXPECT_EQ(fake.recorder.calls().back(), kStore + "synchronize");
}

TEST_F(ApplyTest, ACommitThatFailsWithoutACodeCountsAsSuccess) {
    NetworkingManager& made = openManager();
    store.failures["commit"] = {0};
    EXPECT_TRUE(made.commitPrefs());
    EXPECT_EQ(writes(), (Lines{"commit", "synchronize"}));
    EXPECT_EQ(logged(),
              (Lines{"NetworkingManager: NCPreferencesCommitChanges failed error code 0 error text of 0"}));
}

TEST_F(ApplyTest, AnApplyThatFailsIsAFailureUnlessItHasNoCode) {
    NetworkingManager& made = openManager();
    for (const std::int32_t code : {0, 7}) {
        store.failures["apply"] = {code};
        EXPECT_EQ(made.commitPrefs(), code == 0);
        const std::string text = std::to_string(code);
        EXPECT_EQ(logged(), (Lines{"NetworkingManager: NCPreferencesApplyChanges failed error code " + text +
                                   " error text of " + text}));
    }
    EXPECT_EQ(writes(), (Lines{"commit", "apply", "commit", "apply"}));
}

TEST_F(ApplyTest, ASuccessfulCommitIsSilent) {
    EXPECT_TRUE(openManager().commitPrefs());
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

// Everything together, against a model of the rules that shares nothing with the code

struct Case {
    std::uint64_t warningType;
    std::string choice;
    std::string method;
    bool hasCable;
    std::string failing; // what fails, or none
    std::int32_t code;   // and its code
    std::int64_t wait;
    std::uint64_t failingProbes;

    friend std::ostream& operator<<(std::ostream& out, const Case& each) {
        return out << "type " << each.warningType << ", " << each.choice << ", " << each.method << ", cable "
                   << each.hasCable << ", failing " << each.failing << " with " << each.code << ", wait "
                   << each.wait << ", failing probes " << each.failingProbes;
    }
};

struct Expected {
    bool result = true;
    std::string error; // "", "reachability", "configuration"
    std::uint64_t probes = 0;
    std::uint64_t sleeps = 0;
    Lines calls; // to the store
};

// What a service's IPv4 configuration becomes, nothing being there before.
std::string modelConfiguration(const std::string& method) {
    if (method == "Manual") {
        return "{Addresses = (192.0.2.7); ConfigMethod = Manual; Router = 192.0.2.1; SubnetMasks = "
               "(255.255.255.0)}";
    }
    if (method == "Manual DHCP") {
        return "{Addresses = (192.0.2.7); ConfigMethod = INFORM}";
    }
    return method == "BootP" ? "{ConfigMethod = BOOTP}" : "{ConfigMethod = DHCP; DHCPClientID = me}";
}

// Configures one service.
//  result  whether that counts as success
bool modelService(const Case& given, const std::string& id, Lines& calls) {
    const auto fails = [&](const std::string& call) {
        return given.failing == call;
    };
    calls.push_back("addProtocolType " + id + ", IPv4");
    if (fails("addProtocolType") || fails("copyProtocol IPv4")) {
        return false;
    }
    calls.push_back("setConfiguration " + id + ", IPv4, " + modelConfiguration(given.method));
    calls.push_back("addProtocolType " + id + ", DNS");
    if (fails("copyProtocol DNS")) {
        return false;
    }
    calls.push_back("setConfiguration " + id + ", DNS, {ServerAddresses = (192.0.2.53)}");
    calls.emplace_back("commit");
    calls.emplace_back(fails("commit") ? "synchronize" : "apply");
    return !(fails("commit") || fails("apply")) || given.code == 0;
}

Expected model(const Case& given) {
    Expected expected;
    if (given.choice == "lan" && given.warningType > 0) {
        bool configured = false;
        const bool hasServices = given.failing != "set" && given.failing != "services";
        const Lines configuredServices = given.hasCable ? Lines{"wired"} : Lines{"wired", "spare"};
        for (const std::string& id : hasServices ? configuredServices : Lines()) {
            configured = modelService(given, id, expected.calls);
            expected.calls.push_back("setEnabled " + id + ", yes");
        }
        if (!configured) {
            expected.result = false;
            expected.error = "configuration";
            return expected;
        }
    }
    if (given.warningType == 1) {
        const auto most = static_cast<std::uint64_t>(given.wait) + 1;
        expected.result = given.failingProbes < most;
        expected.probes = expected.result ? given.failingProbes + 1 : most;
        expected.sleeps = expected.result ? given.failingProbes : most;
    }
    if (given.warningType == 2 || !expected.result) {
        expected.result = false;
        expected.error = "reachability";
    }
    return expected;
}

class EveryCombinationTest : public ApplyTest, public testing::WithParamInterface<std::uint64_t> {
  protected:
    void check(const Case& given) {
        store.services = services;
        store.stored.clear();
        store.failures.clear();
        store.hasSet = true;
        store.cannotListServices = false;
        NetworkingManager& made = manualManager();
        made.setDns(Lines{"192.0.2.53"});
        made.setDhcpClientID("me");
        made.setUserChoice(given.choice);
        made.setConfigurationMethod(given.method);
        made.setInternetConnectionWarningType(given.warningType);
        made.setSecondsToWaitForInternetReachability(given.wait);
        setLink("eth0", given.hasCable);
        store.hasSet = given.failing != "set";
        store.cannotListServices = given.failing == "services";
        if (!given.failing.empty()) {
            store.failures[given.failing] = {given.code};
        }
        fake.hostReachability.probes = 0;
        fake.hostReachability.failingProbes = given.failingProbes;
        const auto start = fake.virtualTime.now();
        const Expected expected = model(given);
        EXPECT_EQ(apply(made), expected.result);
        EXPECT_EQ(error, expected.error.empty()             ? untouched
                         : expected.error == "reachability" ? reachabilityError
                                                            : configurationError);
        EXPECT_EQ(fake.hostReachability.probes, expected.probes);
        EXPECT_EQ(fake.virtualTime.now() - start,
                  std::chrono::seconds(static_cast<std::int64_t>(expected.sleeps)));
        Lines calls;
        for (const std::string& call : storeCalls()) {
            calls.push_back(call.substr(kStore.size()));
        }
        EXPECT_EQ(calls, expected.calls);
    }

    const std::vector<fakes::FakeService> services = store.services;
};

TEST_P(EveryCombinationTest, ComesOutAsTheRulesSay) {
    const std::vector<std::string> failures = {"",
                                               "set",
                                               "services",
                                               "copyProtocol IPv4",
                                               "copyProtocol DNS",
                                               "addProtocolType",
                                               "setConfiguration",
                                               "setEnabled",
                                               "commit",
                                               "apply"};
    int cases = 0;
    for (const char* choice : {"lan", "wifi", "no", "other"}) {
        for (const char* method : {"Manual", "Manual DHCP", "DHCP", "BootP", "other"}) {
            for (const bool hasCable : {true, false}) {
                for (const std::string& failing : failures) {
                    for (const std::int32_t code : {0, 7}) {
                        for (const std::uint64_t failingProbes : {0U, 1U, 3U, 4U}) {
                            for (const std::int64_t wait : {0, 3}) {
                                const Case given{GetParam(), choice, method, hasCable,
                                                 failing,    code,   wait,   failingProbes};
                                check(given);
                                ASSERT_FALSE(HasFailure()) << given;
                                ++cases;
                            }
                        }
                    }
                }
            }
        }
    }
    EXPECT_EQ(cases, 4 * 5 * 2 * 10 * 2 * 4 * 2);
}

INSTANTIATE_TEST_SUITE_P(WarningTypes, EveryCombinationTest, testing::Values(0U, 1U, 2U, 3U, 1000U));

} // namespace
} // namespace welcomer
