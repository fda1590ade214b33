// Reading the configuration.

#include "generated/WelcomerConfiguration.h"
#include "tests/unit/network/NetworkingManagerFixture.h"

#include <algorithm>
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

} // namespace
} // namespace welcomer
