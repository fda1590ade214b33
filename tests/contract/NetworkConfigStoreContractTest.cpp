// What a stored network configuration does, whatever it stands on. Each test has a network namespace of its
// own.

#include "tests/contract/NetworkStoresFixture.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <initializer_list>
#include <string>
#include <thread>
#include <vector>

namespace welcomer {
namespace {

class NetworkConfigStoreContractTest : public NetworkStoresContract {};

INSTANTIATE_TEST_SUITE_P(Every, NetworkConfigStoreContractTest, testing::ValuesIn(networkBackends()),
                         [](const auto& each) { return each.param.name; });

TEST_P(NetworkConfigStoreContractTest, EveryLinkButTheLoopbackIsAnInterfaceWithItsKind) {
    shell("ip link add eth7 type veth peer name eth8 && ip link add br0 type bridge && "
          "ip link set eth7 master br0 && ip link add mac0 link eth8 type macvlan && ip link add br1 type "
          "bridge");
    EXPECT_EQ(interfaces(),
              (std::vector<std::string>{"Ethernet eth8", "Ethernet eth7", "Bridge br0 > Ethernet eth7",
                                        "MACVLAN mac0 > Ethernet eth8", "Bridge br1"}));
    EXPECT_EQ(store().copyInterfaces().front()->displayName(), "Ethernet (eth8)");
}

TEST_P(NetworkConfigStoreContractTest, HardwareThatAppearsLaterIsEstablishedToo) {
    const auto connection = store().open("a test");
    const auto set = connection->copyCurrentSet();
    EXPECT_FALSE(set->establishDefaultConfiguration());
    addPair("eth7");
    EXPECT_TRUE(set->establishDefaultConfiguration());
}

TEST_P(NetworkConfigStoreContractTest, AProtocolThatIsThereIsNotAddedAgain) {
    addPair("eth7");
    const auto connection = store().open("a test");
    EXPECT_FALSE(serviceOf(*connection, "eth7")->addProtocolType("IPv4"));
    EXPECT_EQ(connection->lastErrorCode(), platform::kNetworkConfigAlreadyThere);
    EXPECT_EQ(serviceOf(*connection, "eth7")->copyProtocol("IPv4")->configuration(),
              (Dictionary{{"ConfigMethod", "DHCP"}}));
}

TEST_P(NetworkConfigStoreContractTest, AManualConfigurationReplacesWhatWasThere) {
    addPair("eth7");
    const std::vector<std::string> before = {
        "ip addr add 10.0.0.9/8 dev eth7 && ip route add default via 10.0.0.1",
        "ip addr add 192.0.2.9/24 dev eth7 && ip addr add 192.0.2.10/24 dev eth7 && ip route add default via "
        "192.0.2.2",
        "ip addr add 192.0.2.9/24 dev eth7 && ip addr add 192.0.2.7/24 dev eth7",
        "ip addr add 192.0.2.7/16 dev eth7",
        "ip addr add 192.0.2.7/24 dev eth7 && ip route add default via 192.0.2.1 metric 50"};
    for (const std::string& commands : before) {
        shell("ip -4 addr flush dev eth7 && " + commands);
        EXPECT_EQ(configure("eth7", manual("192.0.2.7", "255.255.255.0", "192.0.2.1")), 0) << commands;
        EXPECT_EQ(addresses("eth7"), "192.0.2.7/24\n") << commands;
        EXPECT_EQ(plainDefaultRoutes(), "default via 192.0.2.1 dev eth7 proto static\n") << commands;
    }
}

TEST_P(NetworkConfigStoreContractTest, ApplyingTheSameAgainChangesNothing) {
    addPair("eth7");
    for (int round = 0; round < 3; ++round) {
        EXPECT_EQ(configure("eth7", manual("192.0.2.7", "255.255.255.0", "192.0.2.1")), 0);
        EXPECT_EQ(addresses("eth7"), "192.0.2.7/24\n");
        EXPECT_EQ(plainDefaultRoutes(), "default via 192.0.2.1 dev eth7 proto static\n");
    }
}

TEST_P(NetworkConfigStoreContractTest, WhatMakesNoSenseIsRefusedAndChangesNothing) {
    addPair("eth7");
    shell("ip addr add 10.0.0.9/8 dev eth7");
    const std::string good = "255.255.255.0";
    const std::vector<Dictionary> kBad = {
        manual("no address", good, ""),
        manual("", good, ""),
        manual("192.0.2.256", good, ""),
        manual("0.0.0.0", good, ""),
        manual("192.0.2.7", "255.0.255.0", ""),
        manual("192.0.2.7", "", ""),
        manual("192.0.2.7", "0.0.0.0", ""),
        manual("192.0.2.7", "24", ""),
        manual("192.0.2.7", good, "no router"),
        manual("192.0.2.7\n", good, ""),
        manual("192.0.2.0", good, ""),       // a network
        manual("192.0.2.255", good, ""),     // its broadcast address
        manual("224.0.0.7", good, ""),       // of a group
        manual("239.255.255.250", good, ""), // of a group
        manual("255.255.255.255", good, ""), // everybody
        manual("127.0.0.7", good, ""),       // the machine itself
        manual("0.0.0.7", good, ""),         // nobody yet
        manual("192.0.2.7", good, "192.0.3.1"),
        manual("192.0.2.7", good, "192.0.2.7"),
        manual("192.0.2.7", good, "192.0.2.255"),
        manual("10.9.0.5", "255.255.255.255", "10.9.0.1"),
        {{"ConfigMethod", "Manual"}},
        {{"ConfigMethod", "Manual"},
         {"Addresses", Array{"192.0.2.7"}},
         {"SubnetMasks", Array{good}},
         {"Router", 7}},
        {{"ConfigMethod", "Manual"}, {"Addresses", "192.0.2.7"}, {"SubnetMasks", good}},
        {{"ConfigMethod", "Manual"}, {"Addresses", Array()}, {"SubnetMasks", Array{good}}},
        {{"ConfigMethod", "Manual"}, {"Addresses", Array{7}}, {"SubnetMasks", Array{good}}},
        {{"ConfigMethod", "INFORM"}},
        {{"ConfigMethod", "INFORM"}, {"Addresses", Array{"192.0.2.255"}}},
    };
    for (const Dictionary& bad : kBad) {
        EXPECT_EQ(refusal("eth7", bad), platform::kNetworkConfigInvalid);
    }
    EXPECT_EQ(refusal("eth7", {{"ConfigMethod", "Telepathy"}}), platform::kNetworkConfigUnknownMethod);
    EXPECT_EQ(refusal("eth7", {{"ConfigMethod", 4}}), platform::kNetworkConfigUnknownMethod);
    EXPECT_EQ(addresses("eth7"), "10.0.0.9/8\n");
}

TEST_P(NetworkConfigStoreContractTest, ADeviceThatIsGoneIsAnError) {
    addPair("eth7");
    const auto connection = store().open("a test");
    serviceOf(*connection, "eth7")
        ->copyProtocol("IPv4")
        ->setConfiguration(manual("192.0.2.7", "255.255.255.0", ""));
    shell("ip link del eth7");
    EXPECT_TRUE(connection->commitChanges());
    EXPECT_FALSE(connection->applyChanges());
    EXPECT_EQ(connection->lastErrorCode(), platform::kNetworkConfigNoDevice);
    addPair("eth7");
    EXPECT_TRUE(connection->applyChanges()); // what failed can be tried again
    EXPECT_EQ(addresses("eth7"), "192.0.2.7/24\n");
}

TEST_P(NetworkConfigStoreContractTest, HardwareHasAServiceWhichEstablishingStores) {
    addPair("eth7");
    const auto connection = store().open("a test");
    const auto set = connection->copyCurrentSet();
    const std::string id = *serviceOf(*connection, "eth7")->serviceID();
    EXPECT_TRUE(set->establishDefaultConfiguration());
    EXPECT_TRUE(connection->commitChanges());
    EXPECT_FALSE(set->establishDefaultConfiguration());
    EXPECT_EQ(connection->lastErrorCode(), 0);
    const auto other = store().open("a test");
    EXPECT_FALSE(other->copyCurrentSet()->establishDefaultConfiguration());
    const auto service = serviceOf(*other, "eth7");
    EXPECT_EQ(service->serviceID(), id);
    EXPECT_EQ(service->name(), "Ethernet (eth7)");
    EXPECT_EQ(service->copyProtocol("IPv4")->configuration(), (Dictionary{{"ConfigMethod", "DHCP"}}));
    EXPECT_EQ(service->copyProtocol("DNS")->configuration(), std::nullopt);
    EXPECT_EQ(service->copyProtocols()->size(), 2U);
    EXPECT_EQ(service->copyProtocol("Other"), nullptr);
}

TEST_P(NetworkConfigStoreContractTest, ChangesAreSeenHereAtOnceAndByOthersOnceTheySynchronize) {
    addPair("eth7");
    const auto connection = store().open("a test");
    const auto other = store().open("another");
    const auto service = serviceOf(*connection, "eth7");
    EXPECT_TRUE(service->copyProtocol("IPv4")->setConfiguration({{"ConfigMethod", "BOOTP"}}));
    EXPECT_TRUE(service->addProtocolType("IPv6"));
    EXPECT_TRUE(service->setEnabled(false));
    EXPECT_EQ(service->copyProtocol("IPv4")->configuration(), (Dictionary{{"ConfigMethod", "BOOTP"}}));
    EXPECT_EQ(service->copyProtocol("IPv6")->configuration(), std::nullopt);
    EXPECT_EQ(serviceOf(*store().open("a test"), "eth7")->copyProtocol("IPv6"), nullptr);
    EXPECT_TRUE(connection->commitChanges());
    EXPECT_EQ(serviceOf(*other, "eth7")->copyProtocol("IPv6"), nullptr);
    other->synchronize();
    EXPECT_NE(serviceOf(*other, "eth7")->copyProtocol("IPv6"), nullptr);
    EXPECT_EQ(serviceOf(*other, "eth7")->copyProtocol("IPv4")->configuration(),
              (Dictionary{{"ConfigMethod", "BOOTP"}}));
}

TEST_P(NetworkConfigStoreContractTest, SynchronizingDropsWhatIsNotCommitted) {
    addPair("eth7");
    const auto connection = store().open("a test");
    serviceOf(*connection, "eth7")->copyProtocol("IPv4")->setConfiguration({{"ConfigMethod", "Manual"}});
    connection->synchronize();
    EXPECT_TRUE(connection->commitChanges());
    EXPECT_TRUE(connection->applyChanges());
    EXPECT_EQ(serviceOf(*store().open("a test"), "eth7")->copyProtocol("IPv4")->configuration(),
              (Dictionary{{"ConfigMethod", "DHCP"}}));
}

TEST_P(NetworkConfigStoreContractTest, ConnectionsLoseNoneOfTheirChanges) {
    addPair("eth7");
    addPair("eth8");
    const auto first = store().open("a test");
    const auto second = store().open("another");
    serviceOf(*first, "eth7")->addProtocolType("One");
    serviceOf(*second, "eth7")->addProtocolType("Two");
    serviceOf(*second, "eth8")->addProtocolType("Three");
    EXPECT_TRUE(first->commitChanges());
    EXPECT_TRUE(second->commitChanges());
    const auto read = store().open("a test");
    EXPECT_NE(serviceOf(*read, "eth7")->copyProtocol("One"), nullptr);
    EXPECT_NE(serviceOf(*read, "eth7")->copyProtocol("Two"), nullptr);
    EXPECT_NE(serviceOf(*read, "eth8")->copyProtocol("Three"), nullptr);
}

TEST_P(NetworkConfigStoreContractTest, AManualConfigurationWithoutARouterHasNoDefaultRoute) {
    addPair("eth7");
    EXPECT_EQ(configure("eth7", manual("192.0.2.7", "255.255.254.0", "192.0.2.1")), 0);
    EXPECT_EQ(addresses("eth7"), "192.0.2.7/23\n");
    EXPECT_EQ(plainDefaultRoutes(), "default via 192.0.2.1 dev eth7 proto static\n");
    Dictionary without = manual("192.0.2.7", "255.255.254.0", "");
    EXPECT_EQ(configure("eth7", without), 0);
    EXPECT_EQ(plainDefaultRoutes(), "");
    without.erase("Router");
    EXPECT_EQ(configure("eth7", without), 0);
    EXPECT_EQ(addresses("eth7"), "192.0.2.7/23\n");
}

TEST_P(NetworkConfigStoreContractTest, TheManualDHCPMethodSetsTheAddressThoughNoServerAnswers) {
    addPair("eth7");
    Dictionary inform = manual("192.0.2.7", "255.255.255.0", "192.0.2.1");
    inform["ConfigMethod"] = "INFORM";
    EXPECT_EQ(configure("eth7", inform), 0);
    EXPECT_EQ(addresses("eth7"), "192.0.2.7/24\n");
    inform["Addresses"] = Array{"no address"};
    EXPECT_EQ(refusal("eth7", inform), platform::kNetworkConfigInvalid);
}

TEST_P(NetworkConfigStoreContractTest, ConfigurationsReadBackAsTheyWereWritten) {
    addPair("eth7");
    Dictionary all = manual("192.0.2.7", "255.255.255.0", "");
    all["DHCPClientID"] = "left over";
    all["Unknown"] = Array{1, 2.5, true, Dictionary{{"a", "b\n \t"}}};
    const Dictionary dns = {{"ServerAddresses", Array{"192.0.2.53 "}}, {"DomainName", "home.example"}};
    EXPECT_EQ(configure("eth7", all, dns), 0);
    const auto service = serviceOf(*store().open("a test"), "eth7");
    EXPECT_EQ(service->copyProtocol("IPv4")->configuration(), all);
    EXPECT_EQ(service->copyProtocol("DNS")->configuration(), dns);
}

TEST_P(NetworkConfigStoreContractTest, NameServersThatAreNoneAreRefusedBeforeTheDeviceChanges) {
    addPair("eth7");
    for (const char* bad : {"no address", "", "192.0.2.1\noptions debug", "1.2.3", "\t192.0.2.1"}) {
        EXPECT_EQ(refusal("eth7", manual("192.0.2.7", "255.255.255.0", ""),
                          {{"ServerAddresses", Array{"192.0.2.1", bad}}}),
                  platform::kNetworkConfigInvalid)
            << bad;
    }
    EXPECT_EQ(addresses("eth7"), "\n");
}

TEST_P(NetworkConfigStoreContractTest, WhatWasRefusedStandsInNobodysWay) {
    addPair("eth7");
    const Dictionary good = manual("192.0.2.7", "255.255.255.0", "192.0.2.1");
    EXPECT_EQ(refusal("eth7", good, {{"ServerAddresses", Array{"nonsense"}}}),
              platform::kNetworkConfigInvalid);
    EXPECT_NE(errorText.find("(eth7: name server \"nonsense\")"), std::string::npos) << errorText;
    EXPECT_EQ(configure("eth7", good), 0);
    EXPECT_EQ(addresses("eth7"), "192.0.2.7/24\n");
    // On one connection, too.
    const auto connection = store().open("a test");
    const auto protocol = serviceOf(*connection, "eth7")->copyProtocol("IPv4");
    EXPECT_TRUE(protocol->setConfiguration(manual("abc", "255.255.255.0", "")));
    EXPECT_FALSE(connection->commitChanges());
    EXPECT_TRUE(protocol->setConfiguration(manual("192.0.2.8", "255.255.255.0", "")));
    EXPECT_TRUE(connection->commitChanges());
    EXPECT_TRUE(connection->applyChanges());
    EXPECT_EQ(addresses("eth7"), "192.0.2.8/24\n");
}

TEST_P(NetworkConfigStoreContractTest, OfSeveralServicesNoneIsStoredWhereOneMakesNoSense) {
    addPair("eth7");
    addPair("eth8");
    const auto connection = store().open("a test");
    const Dictionary good = manual("192.0.2.7", "255.255.255.0", "");
    const Dictionary bad = manual("192.0.2.7", "nonsense", "");
    EXPECT_TRUE(serviceOf(*connection, "eth7")->copyProtocol("IPv4")->setConfiguration(good));
    EXPECT_TRUE(serviceOf(*connection, "eth8")->copyProtocol("IPv4")->setConfiguration(bad));
    EXPECT_FALSE(connection->commitChanges());
    EXPECT_EQ(connection->lastErrorCode(), platform::kNetworkConfigInvalid);
    EXPECT_EQ(stored("eth7").front(), (Dictionary{{"ConfigMethod", "DHCP"}}));
    EXPECT_EQ(stored("eth8").front(), (Dictionary{{"ConfigMethod", "DHCP"}}));
}

TEST_P(NetworkConfigStoreContractTest, TheManualDHCPMethodHasANetworkThoughNobodyGaveAMask) {
    addPair("eth7");
    Dictionary inform = {{"ConfigMethod", "INFORM"}, {"Addresses", Array{"10.9.0.5"}}};
    EXPECT_EQ(configure("eth7", inform), 0) << errorText;
    EXPECT_EQ(addresses("eth7"), "10.9.0.5/8\n"); // that of its class
    EXPECT_EQ(plainDefaultRoutes(), "");
    inform["Addresses"] = Array{"192.0.2.5"};
    EXPECT_EQ(configure("eth7", inform), 0) << errorText;
    EXPECT_EQ(addresses("eth7"), "192.0.2.5/24\n");
}

TEST_P(NetworkConfigStoreContractTest, TheManualDHCPMethodTakesTheMaskAndTheRouterThatAreThereStill) {
    addPair("eth7");
    EXPECT_EQ(configure("eth7", manual("192.0.2.7", "255.255.255.128", "192.0.2.1")), 0) << errorText;
    Dictionary inform = *stored("eth7").front();
    inform["ConfigMethod"] = "INFORM";
    inform["Addresses"] = Array{"192.0.2.9"};
    EXPECT_EQ(configure("eth7", inform), 0) << errorText;
    EXPECT_EQ(addresses("eth7"), "192.0.2.9/25\n");
    EXPECT_EQ(plainDefaultRoutes(), "default via 192.0.2.1 dev eth7 proto static\n");
    inform["Addresses"] = Array{"192.0.2.130"}; // from where the router is not to be seen
    EXPECT_EQ(configure("eth7", inform), 0) << errorText;
    EXPECT_EQ(addresses("eth7"), "192.0.2.130/25\n");
    EXPECT_EQ(plainDefaultRoutes(), "");
    EXPECT_EQ(stored("eth7").front(), inform);
}

TEST_P(NetworkConfigStoreContractTest, AServiceWhoseDeviceBecameAPortIsPassedOverForTheBridge) {
    addPair("eth7");
    EXPECT_EQ(configure("eth7", manual("192.0.2.7", "255.255.255.0", "")), 0) << errorText;
    EXPECT_EQ(serviceInterfaces(*store().open("a test")).front(), "Ethernet eth7");
    backend->addBridge("br0", "eth7");
    const auto connection = store().open("a test");
    const std::vector<std::string> all = serviceInterfaces(*connection);
    EXPECT_EQ(std::ranges::count(all, "Ethernet eth7"), 0);
    EXPECT_EQ(std::ranges::count(all, "Bridge br0 > Ethernet eth7"), 1);
    EXPECT_FALSE(connection->copyCurrentSet()->establishDefaultConfiguration() &&
                 serviceOf(*connection, "eth7")); // nor is there a new one for the port
    EXPECT_EQ(configure("br0", manual("192.0.2.9", "255.255.255.0", "")), 0) << errorText;
    EXPECT_EQ(addresses("br0"), "192.0.2.9/24\n");
    EXPECT_EQ(addresses("eth7"), "\n");
}

TEST_P(NetworkConfigStoreContractTest, AnErrorBelongsToTheConnectionThatMetIt) {
    addPair("eth7");
    const auto first = store().open("a test");
    const auto second = store().open("another");
    const auto service = serviceOf(*first, "eth7");
    EXPECT_FALSE(service->addProtocolType("IPv4"));
    EXPECT_TRUE(serviceOf(*second, "eth7")->addProtocolType("One"));
    const platform::NetworkConfigHandle& handle = *service;
    for (const platform::NetworkConfigHandle* each :
         std::initializer_list<const platform::NetworkConfigHandle*>{first.get(), &handle}) {
        EXPECT_EQ(each->lastErrorCode(), platform::kNetworkConfigAlreadyThere);
        EXPECT_EQ(each->lastErrorText(), "the service has a protocol of that type already");
    }
    EXPECT_EQ(second->lastErrorCode(), 0);
    std::thread([&] { EXPECT_EQ(first->lastErrorCode(), platform::kNetworkConfigAlreadyThere); }).join();
}

} // namespace
} // namespace welcomer
