// Reading the configuration, and probing.

#include "generated/WelcomerConfiguration.h"
#include "log/PCLogManager.h"
#include "tests/unit/network/NetworkingManagerFixture.h"

#include <algorithm>
#include <cstdint>
#include <iterator>
#include <thread>
#include <tuple>

namespace welcomer {
namespace {

using namespace std::chrono_literals;
using platform::NetworkDomain;
using platform::NetworkEntity;

const std::string kInternalAddress = std::string(configuration::kInternalAddressPrefix) + "9";

// The defaults

TEST_F(NetworkingManagerTest, TheDefaultsAreReadWhenItIsMade) {
    setWholeState();
    manager.emplace();
    EXPECT_EQ(manager->defaultConfigurationMethod(), "DHCP");
    EXPECT_EQ(manager->defaultIPAddress(), "192.0.2.7");
    EXPECT_EQ(manager->defaultSubnetMask(), "255.255.255.0");
    EXPECT_EQ(manager->defaultRouter(), "192.0.2.1");
    EXPECT_EQ(manager->defaultDNS(), (Lines{"192.0.2.53", "192.0.2.54"}));
    EXPECT_EQ(manager->defaultSearchDomains(), (Lines{"home.example"}));
    EXPECT_EQ(fake.recorder.callsTo("NetworkStateStore."),
              (Lines{"NetworkStateStore.open Welcomer", "NetworkStateStore.copyValue State, global, DNS",
                     "NetworkStateStore.copyValue State, global, IPv4",
                     "NetworkStateStore.copyValue Setup, service one, IPv4",
                     "NetworkStateStore.copyValue State, service one, IPv4", "NetworkStateStore.close"}));
    EXPECT_EQ(storeCalls(), Lines());
}

TEST_F(NetworkingManagerTest, WhatWasReadIsLoggedInOrder) {
    setWholeState();
    manager.emplace();
    EXPECT_EQ(logged(),
              (Lines{"--- WLCopyNetworkConfig ---", "IP: 192.0.2.7", "Mask: 255.255.255.0",
                     "Router: 192.0.2.1", "DNS: 192.0.2.53", "Domain: home.example", "Config Method: DHCP"}));
}

TEST_F(NetworkingManagerTest, TheStateStoreIsClosedBeforeWhatWasReadIsLogged) {
    setWholeState();
    manager.emplace();
    const Lines calls = fake.recorder.calls();
    const auto closed = std::ranges::find(calls, "NetworkStateStore.close");
    ASSERT_NE(closed, calls.end());
    EXPECT_EQ(*std::next(closed), "SystemLog.write 115, --- WLCopyNetworkConfig ---");
}

TEST_F(NetworkingManagerTest, AMachineWithoutANetworkHasNoDefaultsAndALogOfNothing) {
    manager.emplace();
    EXPECT_EQ(manager->defaultIPAddress(), std::nullopt);
    EXPECT_EQ(manager->defaultDNS(), std::nullopt);
    EXPECT_EQ(manager->defaultSearchDomains(), std::nullopt);
    EXPECT_EQ(logged(), (Lines{"--- WLCopyNetworkConfig ---", "IP: (null)", "Mask: (null)", "Router: (null)",
                               "Domain: (null)", "Config Method: (null)"}));
}

TEST_F(NetworkingManagerTest, AStateStoreThatCannotBeOpenedIsOneLine) {
    setWholeState();
    fake.networkStateStore.cannotOpen = true;
    manager.emplace();
    EXPECT_EQ(logged(), (Lines{"NetworkingManager: error connecting to dynamic store"}));
    EXPECT_EQ(manager->defaultIPAddress(), std::nullopt);
}

TEST_F(NetworkingManagerTest, ALinkLocalAddressIsNoDefaultButLogged) {
    setWholeState();
    setState(serviceKey(NetworkDomain::State, "one"), {{"Addresses", Array{"169.254.3.4"}}});
    manager.emplace();
    EXPECT_EQ(manager->defaultConfigurationMethod(), std::nullopt);
    EXPECT_EQ(manager->defaultIPAddress(), std::nullopt);
    EXPECT_EQ(manager->defaultSubnetMask(), std::nullopt);
    EXPECT_EQ(manager->defaultRouter(), std::nullopt);
    EXPECT_EQ(manager->defaultDNS(), std::nullopt);
    EXPECT_EQ(manager->defaultSearchDomains(), std::nullopt);
    EXPECT_EQ(logged().at(1), "IP: 169.254.3.4");
}

TEST_F(NetworkingManagerTest, OnlyTheWholeLinkLocalPrefixCounts) {
    for (const char* address : {"169.25.4.1", "169.2540.1", "10.169.254.1"}) {
        setWholeState();
        setState(serviceKey(NetworkDomain::State, "one"), {{"Addresses", Array{address}}});
        manager.emplace();
        EXPECT_EQ(manager->defaultIPAddress(), address);
    }
}

TEST_F(NetworkingManagerTest, AnEmptyAddressIsNoDefault) {
    setWholeState();
    setState(serviceKey(NetworkDomain::State, "one"), {{"Addresses", Array{""}}});
    manager.emplace();
    EXPECT_EQ(manager->defaultIPAddress(), std::nullopt);
    EXPECT_EQ(manager->defaultRouter(), std::nullopt);
}

TEST_F(NetworkingManagerTest, WithoutADNSEntityThereIsNoServerListNoServerLineAndAnEmptyDomainList) {
    setWholeState();
    fake.networkStateStore.values.erase(globalKey(NetworkEntity::DNS));
    manager.emplace();
    EXPECT_EQ(manager->defaultDNS(), std::nullopt);
    EXPECT_EQ(manager->defaultSearchDomains(), Lines());
    EXPECT_EQ(logged(), (Lines{"--- WLCopyNetworkConfig ---", "IP: 192.0.2.7", "Mask: 255.255.255.0",
                               "Router: 192.0.2.1", "Domain: (null)", "Config Method: DHCP"}));
}

TEST_F(NetworkingManagerTest, AnEmptyServerListIsKeptAndItsLineShowsNone) {
    setWholeState();
    setState(globalKey(NetworkEntity::DNS), {{"ServerAddresses", Array()}});
    manager.emplace();
    EXPECT_EQ(manager->defaultDNS(), Lines());
    EXPECT_EQ(logged().at(4), "DNS: (null)");
}

TEST_F(NetworkingManagerTest, EachDefaultIsNoneWhereTheStateHasNothing) {
    setWholeState();
    setState(globalKey(NetworkEntity::IPv4), {{"PrimaryService", "one"}});
    fake.networkStateStore.values.erase(serviceKey(NetworkDomain::Setup, "one"));
    setState(serviceKey(NetworkDomain::State, "one"),
             {{"Addresses", Array{"192.0.2.7"}}, {"SubnetMasks", Array()}});
    manager.emplace();
    EXPECT_EQ(manager->defaultIPAddress(), "192.0.2.7");
    EXPECT_EQ(manager->defaultRouter(), std::nullopt);
    EXPECT_EQ(manager->defaultConfigurationMethod(), std::nullopt);
    EXPECT_EQ(manager->defaultSubnetMask(), std::nullopt);
}

TEST_F(NetworkingManagerTest, WithoutAPrimaryServiceNoServiceIsAskedFor) {
    setWholeState();
    setState(globalKey(NetworkEntity::IPv4), {{"Router", "192.0.2.1"}});
    manager.emplace();
    EXPECT_EQ(manager->defaultIPAddress(), std::nullopt);
    EXPECT_EQ(logged().at(3), "Router: 192.0.2.1");
    EXPECT_EQ(fake.recorder.callsTo("NetworkStateStore.copyValue").size(), 2U);
}

TEST_F(NetworkingManagerTest, ValuesOfAWrongTypeCountAsMissing) {
    setState(globalKey(NetworkEntity::DNS), {{"ServerAddresses", "192.0.2.53"}, {"DomainName", 4}});
    setState(globalKey(NetworkEntity::IPv4), {{"Router", Array{}}, {"PrimaryService", "one"}});
    setState(serviceKey(NetworkDomain::State, "one"),
             {{"Addresses", Array{7}}, {"SubnetMasks", "255.0.0.0"}});
    manager.emplace();
    EXPECT_EQ(logged(), (Lines{"--- WLCopyNetworkConfig ---", "IP: (null)", "Mask: (null)", "Router: (null)",
                               "Domain: (null)", "Config Method: (null)"}));
}

TEST_F(NetworkingManagerTest, TheDefaultsAreNeverReadAgain) {
    setWholeState();
    manager.emplace();
    setState(serviceKey(NetworkDomain::State, "one"), {{"Addresses", Array{"192.0.2.99"}}});
    manager->systemPreferences();
    EXPECT_EQ(manager->defaultIPAddress(), "192.0.2.7");
}

// What the user wants

TEST_F(NetworkingManagerTest, NothingIsSetAtFirst) {
    manager.emplace();
    EXPECT_EQ(manager->userChoice(), std::nullopt);
    EXPECT_EQ(manager->configurationMethod(), std::nullopt);
    EXPECT_EQ(manager->ipAddress(), std::nullopt);
    EXPECT_EQ(manager->subnetMask(), std::nullopt);
    EXPECT_EQ(manager->router(), std::nullopt);
    EXPECT_EQ(manager->dns(), std::nullopt);
    EXPECT_EQ(manager->searchDomains(), std::nullopt);
    EXPECT_EQ(manager->dhcpClientID(), std::nullopt);
    EXPECT_EQ(manager->internetConnectionWarningType(), 0U);
    EXPECT_EQ(manager->secondsToWaitForInternetReachability(), 0);
}

TEST_F(NetworkingManagerTest, TheDefaultDHCPClientIDIsAlwaysNone) {
    setWholeState();
    setState(serviceKey(NetworkDomain::Setup, "one"), {{"ConfigMethod", "DHCP"}, {"DHCPClientID", "me"}});
    manager.emplace();
    manager->setDhcpClientID("me");
    EXPECT_EQ(manager->defaultDhcpClientID(), std::nullopt);
}

TEST_F(NetworkingManagerTest, TheChoiceCountsCharacterByCharacter) {
    manager.emplace();
    using Answers = std::tuple<bool, bool, bool>;
    const auto answers = [&](const NetworkingManager::Text& choice) {
        manager->setUserChoice(choice);
        return Answers{manager->userSaidConfigureWiFi(), manager->userSaidConfigureLAN(),
                       manager->userSaidNoInternetForNow()};
    };
    EXPECT_EQ(answers("wifi"), Answers(true, false, false));
    EXPECT_EQ(answers("lan"), Answers(false, true, false));
    EXPECT_EQ(answers("no"), Answers(false, false, true));
    for (const NetworkingManager::Text& other :
         {NetworkingManager::Text("LAN"), NetworkingManager::Text("wifi "), NetworkingManager::Text(""),
          NetworkingManager::Text()}) {
        EXPECT_EQ(answers(other), Answers(false, false, false));
    }
}

TEST_F(NetworkingManagerTest, TextsAndListsMayBeSetOnOneThreadWhileAnotherReadsThem) {
    manager.emplace();
    std::thread setter([&] {
        for (int round = 0; round < 1000; ++round) {
            manager->setIpAddress(std::string(100, 'a'));
            manager->setDns(Lines{"a", "b"});
        }
    });
    for (int round = 0; round < 1000; ++round) {
        const auto address = manager->ipAddress();
        const auto dns = manager->dns();
        EXPECT_TRUE(!address || *address == std::string(100, 'a'));
        EXPECT_TRUE(!dns || dns->size() == 2);
    }
    setter.join();
}

// The hardware key and the stored method

class HardwareKeyManager : public NetworkingManager {
  public:
    using NetworkingManager::_hardwareKey;
};

TEST_F(NetworkingManagerTest, EveryChoiceButTheLANIsTheWirelessKey) {
    HardwareKeyManager open;
    EXPECT_EQ(open._hardwareKey(), "Wireless");
    for (const char* choice : {"wifi", "no", "LAN", ""}) {
        open.setUserChoice(choice);
        EXPECT_EQ(open._hardwareKey(), "Wireless") << choice;
    }
    open.setUserChoice("lan");
    EXPECT_EQ(open._hardwareKey(), "Ethernet");
}

TEST_F(NetworkingManagerTest, TheStoredMethodIsThatOfTheChosenService) {
    store.services = {service("radio", "wlan0", "Wireless"), service("wired", "eth0")};
    store.services[0].protocols = {{"IPv4", Dictionary{{"ConfigMethod", "BOOTP"}}}};
    store.services[1].protocols = {{"IPv4", Dictionary{{"ConfigMethod", "Manual"}}}};
    NetworkingManager& made = openManager();
    EXPECT_EQ(made.defaultIP4ConfigurationMethod(), "BOOTP");
    made.setUserChoice("lan");
    EXPECT_EQ(made.defaultIP4ConfigurationMethod(), "Manual");
}

TEST_F(NetworkingManagerTest, TheStoredMethodIsNoneWhereAnythingOnTheWayIsMissing) {
    NetworkingManager& made = openManager();
    made.setUserChoice("lan");
    EXPECT_EQ(made.defaultIP4ConfigurationMethod(), std::nullopt);
    store.services = {service("wired", "eth0")};
    EXPECT_EQ(made.defaultIP4ConfigurationMethod(), std::nullopt);
    store.services[0].protocols = {{"IPv4", std::nullopt}};
    EXPECT_EQ(made.defaultIP4ConfigurationMethod(), std::nullopt);
    store.services[0].protocols = {{"IPv4", Dictionary()}};
    EXPECT_EQ(made.defaultIP4ConfigurationMethod(), std::nullopt);
    store.services[0].protocols = {{"IPv4", Dictionary{{"ConfigMethod", 4}}}};
    EXPECT_EQ(made.defaultIP4ConfigurationMethod(), std::nullopt);
    store.hasSet = false;
    EXPECT_EQ(made.defaultIP4ConfigurationMethod(), std::nullopt);
}

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

// The internet

TEST_F(NetworkingManagerTest, ProbesThePublicWebHost) {
    const std::string host(configuration::kPublicWebHost);
    EXPECT_TRUE(NetworkingManager::internetIsReachable());
    EXPECT_EQ(fake.recorder.calls(),
              (Lines{"HostReachability.createTarget " + host, "HostReachability.flags " + host}));
}

TEST_F(NetworkingManagerTest, TheInternetIsReachableExactlyWhenBitTwoIsSetAndBitFourIsClear) {
    for (std::uint32_t flags = 0; flags < 16; ++flags) {
        fake.hostReachability.flags = flags;
        EXPECT_EQ(NetworkingManager::internetIsReachable(), (flags & 6) == 2) << flags;
    }
}

TEST_F(NetworkingManagerTest, AHostReachableOnlyAfterAConnectionIsBroughtUpIsNotReachable) {
    fake.hostReachability.flags = platform::kHostReachable | platform::kHostConnectionRequired;
    EXPECT_FALSE(NetworkingManager::internetIsReachable());
}

TEST_F(NetworkingManagerTest, FlagsThatCannotBeReadAreNotReachable) {
    fake.hostReachability.flags = std::nullopt;
    EXPECT_FALSE(NetworkingManager::internetIsReachable());
}

// The maker's own network

TEST_F(NetworkingManagerTest, TheInternalNetworkTakesBothTheAddressAndTheMarker) {
    for (const bool hasMarker : {false, true}) {
        if (hasMarker) {
            fake.fileSystem.addDirectory("/CorvidInternal");
        }
        setWholeState();
        EXPECT_FALSE(NetworkingManager::isOnCorvidInternalNetwork());
        setState(serviceKey(NetworkDomain::State, "one"), {{"Addresses", Array{kInternalAddress}}});
        EXPECT_EQ(NetworkingManager::isOnCorvidInternalNetwork(), hasMarker);
        setState(serviceKey(NetworkDomain::State, "one"), {{"Addresses", Array{"1" + kInternalAddress}}});
        EXPECT_FALSE(NetworkingManager::isOnCorvidInternalNetwork());
    }
}

TEST_F(NetworkingManagerTest, TheCurrentAddressIsReadAsTheDefaultsAreWithTheMethodReadAndDropped) {
    setWholeState();
    NetworkingManager::isOnCorvidInternalNetwork();
    EXPECT_EQ(fake.recorder.callsTo("NetworkStateStore."),
              (Lines{"NetworkStateStore.open Welcomer", "NetworkStateStore.copyValue State, global, IPv4",
                     "NetworkStateStore.copyValue Setup, service one, IPv4",
                     "NetworkStateStore.copyValue State, service one, IPv4", "NetworkStateStore.close"}));
}

TEST_F(NetworkingManagerTest, WithoutAnyStateThisIsNotTheInternalNetwork) {
    fake.fileSystem.addDirectory("/CorvidInternal");
    EXPECT_FALSE(NetworkingManager::isOnCorvidInternalNetwork());
    setState(globalKey(NetworkEntity::IPv4), {{"Router", "192.0.2.1"}});
    EXPECT_FALSE(NetworkingManager::isOnCorvidInternalNetwork());
    setState(globalKey(NetworkEntity::IPv4), {{"PrimaryService", "one"}});
    EXPECT_FALSE(NetworkingManager::isOnCorvidInternalNetwork());
    for (const Array& addresses : {Array(), Array{""}}) {
        setState(serviceKey(NetworkDomain::State, "one"), {{"Addresses", addresses}});
        EXPECT_FALSE(NetworkingManager::isOnCorvidInternalNetwork());
    }
    setState(serviceKey(NetworkDomain::State, "one"), {{"Addresses", Array{kInternalAddress}}});
    fake.networkStateStore.cannotOpen = true;
    EXPECT_FALSE(NetworkingManager::isOnCorvidInternalNetwork());
}

// The cable

TEST_F(NetworkingManagerTest, OnlyTheServiceWhoseLinkIsActiveHasItsCableIn) {
    store.services = {service("first", "eth0"), service("second", "eth1"),
                      service("radio", "wlan0", "Wireless")};
    setLink("eth0", false);
    setLink("eth1", true);
    setLink("wlan0", true);
    NetworkingManager& made = openManager();
    const auto plugged = made.servicesWithEthernetPluggedIn();
    ASSERT_TRUE(plugged);
    ASSERT_EQ(plugged->size(), 1U);
    EXPECT_EQ(plugged->front()->serviceID(), "second");
    EXPECT_TRUE(made.isEthernetCablePluggedIn());
}

TEST_F(NetworkingManagerTest, TheLinkIsAskedForUnderItsOwnClientName) {
    store.services = {service("first", "eth0")};
    openManager().isEthernetCablePluggedIn();
    EXPECT_EQ(fake.recorder.callsTo("NetworkStateStore."),
              (Lines{"NetworkStateStore.open FirstRun",
                     "NetworkStateStore.copyValue State, interface eth0, Link", "NetworkStateStore.close"}));
}

TEST_F(NetworkingManagerTest, TheCableIsThatOfTheEthernetInterfaceInTheChain) {
    store.services = {service("bridge", "br0", "Bridge")};
    store.services[0].chain.push_back({"Ethernet", "eth0", "Ethernet (eth0)"});
    setLink("br0", false);
    setLink("eth0", true);
    EXPECT_TRUE(openManager().isEthernetCablePluggedIn());
}

TEST_F(NetworkingManagerTest, ALinkThatIsUnknownOrSaysNothingIsNotActive) {
    store.services = {service("first", "eth0")};
    NetworkingManager& made = openManager();
    EXPECT_FALSE(made.isEthernetCablePluggedIn());
    const Key key = Key::interface(NetworkDomain::State, "eth0", NetworkEntity::Link);
    for (const Dictionary& value :
         {Dictionary(), Dictionary{{"Active", "yes"}}, Dictionary{{"Active", false}}}) {
        setState(key, value);
        EXPECT_FALSE(made.isEthernetCablePluggedIn());
    }
    setLink("eth0", true);
    EXPECT_TRUE(made.isEthernetCablePluggedIn());
    fake.networkStateStore.cannotOpen = true;
    EXPECT_FALSE(made.isEthernetCablePluggedIn());
}

TEST_F(NetworkingManagerTest, AnInterfaceWithoutADeviceHasNoCable) {
    store.services = {service("first", "eth0")};
    store.services[0].chain[0].device = std::nullopt;
    EXPECT_FALSE(openManager().isEthernetCablePluggedIn());
    EXPECT_EQ(fake.recorder.callsTo("NetworkStateStore."), Lines());
}

TEST_F(NetworkingManagerTest, ServicesThatCannotBeListedAreNoneAndWithoutACable) {
    NetworkingManager& made = openManager();
    EXPECT_TRUE(made.servicesWithEthernetPluggedIn());
    store.cannotListServices = true;
    EXPECT_FALSE(made.servicesWithEthernetPluggedIn());
    EXPECT_FALSE(made.isEthernetCablePluggedIn());
    store.cannotListServices = false;
    store.hasSet = false;
    EXPECT_FALSE(made.servicesWithEthernetPluggedIn());
    EXPECT_FALSE(made.isEthernetCablePluggedIn());
}

// Dynamic configuration

class DynamicConfigurationTest : public NetworkingManagerTest {
  protected:
    NetworkingManager& managerWithMethod(const std::string& method) {
        store.services = {service("wired", "eth0")};
        store.services[0].protocols = {{"IPv4", Dictionary{{"ConfigMethod", method}}}};
        return openManager();
    }
};

TEST_F(DynamicConfigurationTest, AReachableHostMakesItUsable) {
    for (const std::string method : {"BOOTP", "DHCP", "LinkLocal"}) {
        fake.hostReachability.flags = platform::kHostReachable;
        EXPECT_TRUE(managerWithMethod(method).hasUsableDynamicEthernetConfiguration());
        const std::string first =
            "NetworkingManager: hasUsableDynamicEthernetConfiguration: (configMethod " + method + ")";
        EXPECT_EQ(logged(), (Lines{first, "hasUsableDynamicEthernetConfiguration: reg. host reachable."}));
        fake.hostReachability.flags = 0U;
        EXPECT_FALSE(manager->hasUsableDynamicEthernetConfiguration());
        EXPECT_EQ(logged(),
                  (Lines{first, "hasUsableDynamicEthernetConfiguration: reg. host *NOT* reachable."}));
    }
}

TEST_F(DynamicConfigurationTest, AnAddressOfThePrimaryServiceMakesItUnusableWithoutProbing) {
    for (const char* address : {"192.0.2.7", "169.254.1.1"}) {
        setWholeState();
        setState(serviceKey(NetworkDomain::State, "one"), {{"Addresses", Array{address}}});
        EXPECT_FALSE(managerWithMethod("DHCP").hasUsableDynamicEthernetConfiguration());
        EXPECT_EQ(logged(),
                  (Lines{"NetworkingManager: hasUsableDynamicEthernetConfiguration: (configMethod DHCP)"}));
        EXPECT_EQ(fake.recorder.callsTo("HostReachability."), Lines());
    }
}

TEST_F(DynamicConfigurationTest, AnEmptyAddressOfThePrimaryServiceIsNone) {
    setWholeState();
    for (const Array& addresses : {Array{""}, Array{}}) {
        setState(serviceKey(NetworkDomain::State, "one"), {{"Addresses", addresses}});
        EXPECT_TRUE(managerWithMethod("DHCP").hasUsableDynamicEthernetConfiguration());
    }
}

TEST_F(DynamicConfigurationTest, AnotherMethodIsNotUsable) {
    for (const std::string method : {"Manual", "INFORM", "BootP", "dhcp", ""}) {
        EXPECT_FALSE(managerWithMethod(method).hasUsableDynamicEthernetConfiguration());
        EXPECT_EQ(logged(),
                  (Lines{"NetworkingManager: hasUsableDynamicEthernetConfiguration: (configMethod " + method +
                         ")"}));
        EXPECT_EQ(fake.recorder.callsTo("HostReachability."), Lines());
    }
}

TEST_F(DynamicConfigurationTest, WithoutASetAServiceAProtocolOrAMethodItIsSilentlyUnusable) {
    NetworkingManager& made = managerWithMethod("DHCP");
    store.services[0].protocols = {{"IPv4", Dictionary()}};
    EXPECT_FALSE(made.hasUsableDynamicEthernetConfiguration());
    store.services[0].protocols = {{"IPv4", std::nullopt}};
    EXPECT_FALSE(made.hasUsableDynamicEthernetConfiguration());
    store.services[0].protocols = {};
    EXPECT_FALSE(made.hasUsableDynamicEthernetConfiguration());
    store.services = {service("radio", "wlan0", "Wireless")};
    EXPECT_FALSE(made.hasUsableDynamicEthernetConfiguration());
    store.hasSet = false;
    EXPECT_FALSE(made.hasUsableDynamicEthernetConfiguration());
    EXPECT_EQ(logged(), Lines());
}

// Directories

TEST_F(NetworkingManagerTest, ASearchPathOfLocalNodesIsNoDirectoryAndOneLine) {
    manager.emplace();
    fake.recorder.clear();
    logged();
    fake.directoryService.subnodes = {"local", "local two", "local three", "local four"};
    EXPECT_FALSE(manager->dirServiceNodesExist());
    EXPECT_EQ(
        logged(),
        (Lines{"NetworkingManager: DirService: search paths: (local, local two, local three, local four)"}));
    EXPECT_EQ(fake.recorder.callsTo("DirectoryService."),
              (Lines{"DirectoryService.openNode 8705", "DirectoryService.subnodeNames"}));
    fake.directoryService.subnodes = {};
    EXPECT_FALSE(manager->dirServiceNodesExist());
    EXPECT_EQ(logged(), (Lines{"NetworkingManager: DirService: search paths: ()"}));
}

TEST_F(NetworkingManagerTest, AtLeastThreeReachableNodesAreEnough) {
    manager.emplace();
    logged();
    fake.directoryService.subnodes = {"local", "a", "b"};
    fake.directoryService.unreachable = {"a"};
    EXPECT_FALSE(manager->dirServiceNodesExist());
    EXPECT_EQ(logged(), (Lines{"NetworkingManager: DirService: search paths: (local, a, b)",
                               "NetworkingManager: DirService: subnodeNames (local, a, b)",
                               "NetworkingManager: DirService: unreachableSubnodeNames (a)",
                               "NetworkingManager: DirService: reachableNodes 2"}));
    fake.directoryService.subnodes = {"local", "a", "b", "c"};
    EXPECT_TRUE(manager->dirServiceNodesExist());
    EXPECT_EQ(logged().back(), "NetworkingManager: DirService: reachableNodes 3");
    fake.directoryService.unreachable = {"elsewhere"};
    EXPECT_TRUE(manager->dirServiceNodesExist());
}

TEST_F(NetworkingManagerTest, TheSearchPathIsReadAgainBeforeItsNodesAreCounted) {
    manager.emplace();
    fake.directoryService.subnodes = {"local", "a"};
    PCLogManager::sharedManager().setObserver([&](const PCLogManager::Call& call) {
        if (call.message.find("search paths") != std::string::npos) {
            fake.directoryService.subnodes = {"local", "a", "b"};
        }
    });
    EXPECT_TRUE(manager->dirServiceNodesExist());
    PCLogManager::sharedManager().setObserver({});
    EXPECT_EQ(fake.recorder.callsTo("DirectoryService."),
              (Lines{"DirectoryService.openNode 8705", "DirectoryService.subnodeNames",
                     "DirectoryService.openNode 8705", "DirectoryService.subnodeNames",
                     "DirectoryService.unreachableSubnodeNames"}));
}

TEST_F(NetworkingManagerTest, BothListsOfNodesAreReadBeforeTheyAreLogged) {
    manager.emplace();
    fake.directoryService.subnodes = {"local", "a", "b"};
    EXPECT_TRUE(manager->dirServiceNodesExist());
    const Lines calls = fake.recorder.calls();
    const auto read = std::ranges::find(calls, "DirectoryService.unreachableSubnodeNames");
    ASSERT_NE(read, calls.end());
    EXPECT_EQ(*std::next(read),
              "SystemLog.write 115, NetworkingManager: DirService: subnodeNames (local, a, b)");
}

TEST_F(NetworkingManagerTest, FewerThanThreeNodesAreNotCounted) {
    manager.emplace();
    logged();
    fake.directoryService.subnodes = {"local", "a"};
    EXPECT_FALSE(manager->dirServiceNodesExist());
    EXPECT_EQ(logged(), (Lines{"NetworkingManager: DirService: search paths: (local, a)"}));
    EXPECT_EQ(fake.recorder.callsTo("DirectoryService.unreachable"), Lines());
}

TEST_F(NetworkingManagerTest, ADirectoryNodeThatCannotBeOpenedIsAsAnEmptyPathOrTheEnd) {
    manager.emplace();
    logged();
    fake.directoryService.subnodes = {"local", "a", "b"};
    fake.directoryService.openings = 0;
    EXPECT_FALSE(manager->dirServiceNodesExist());
    EXPECT_EQ(logged(), (Lines{"NetworkingManager: DirService: search paths: ()"}));
    fake.directoryService.openings = 1;
    EXPECT_FALSE(manager->dirServiceNodesExist());
    EXPECT_EQ(logged(), (Lines{"NetworkingManager: DirService: search paths: (local, a, b)"}));
}

} // namespace
} // namespace welcomer
