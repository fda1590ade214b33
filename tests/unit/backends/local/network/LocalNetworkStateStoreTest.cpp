// What the state store on the kernel tells besides, of what nobody configured. Each test has a network
// namespace of its own.

#include "tests/contract/NetworkStoresFixture.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <string>
#include <vector>

namespace welcomer {
namespace {

class LocalNetworkStateStoreTest : public KernelNetworkStores {};

TEST_F(LocalNetworkStateStoreTest, TheAddressesOfAServiceAreThoseOfItsDeviceInTheKernelsOrder) {
    addPair("eth7");
    EXPECT_EQ(serviceIPv4("eth7"), std::nullopt);
    shell("ip addr add 192.0.2.7/24 dev eth7 && ip addr add 192.0.2.8/24 dev eth7 && "
          "ip addr add 10.1.2.3/9 dev eth7 && ip addr add 198.51.100.1/24 dev p-eth7");
    EXPECT_EQ(serviceIPv4("eth7"),
              (Dictionary{{"Addresses", Array{"192.0.2.7", "10.1.2.3", "192.0.2.8"}},
                          {"SubnetMasks", Array{"255.255.255.0", "255.128.0.0", "255.255.255.0"}}}));
}

TEST_F(LocalNetworkStateStoreTest, TheAddressOfAPointToPointLinkIsItsOwn) {
    addPair("eth7");
    shell("ip addr add 192.0.2.7 peer 198.51.100.1/32 dev eth7");
    EXPECT_EQ(serviceIPv4("eth7")->at("Addresses"), PropertyList(Array{"192.0.2.7"}));
}

TEST_F(LocalNetworkStateStoreTest, ThePrimaryServiceOwnsTheDefaultRouteWithTheLowestMetric) {
    addPair("eth7");
    addPair("eth8");
    shell("ip addr add 192.0.2.7/24 dev eth7 && ip addr add 198.51.100.7/24 dev eth8");
    EXPECT_EQ(globalIPv4(), std::nullopt);
    shell("ip route add default via 192.0.2.1 dev eth7 metric 200");
    EXPECT_EQ(globalIPv4(), (Dictionary{{"PrimaryService", "eth7"}, {"Router", "192.0.2.1"}}));
    shell("ip route add default via 198.51.100.1 dev eth8 metric 100");
    EXPECT_EQ(globalIPv4(), (Dictionary{{"PrimaryService", "eth8"}, {"Router", "198.51.100.1"}}));
    shell("ip route add default dev eth7");
    EXPECT_EQ(globalIPv4(), (Dictionary{{"PrimaryService", "eth7"}}));
}

TEST_F(LocalNetworkStateStoreTest, OnlyDefaultRoutesOfTheMainTableCount) {
    addPair("eth7");
    shell("ip addr add 192.0.2.7/24 dev eth7 && ip route add default via 192.0.2.1 table 99 && "
          "ip route add 203.0.113.0/24 via 192.0.2.1 && ip route add unreachable default metric 4000 && "
          "ip -6 route add default dev eth7");
    EXPECT_EQ(globalIPv4(), std::nullopt);
    shell("ip route add default nexthop via 192.0.2.2 dev eth7 nexthop via 192.0.2.3 dev eth7");
    EXPECT_EQ(globalIPv4(), (Dictionary{{"PrimaryService", "eth7"}, {"Router", "192.0.2.2"}}));
}

TEST_F(LocalNetworkStateStoreTest, ServersAndDomainComeFromTheResolversFile) {
    const Key key = Key::global(NetworkDomain::State, NetworkEntity::DNS);
    EXPECT_EQ(value(key),
              (Dictionary{{"ServerAddresses", Array{"192.0.2.53"}}, {"DomainName", "home.example"}}));
    root.addFile("/etc/resolv.conf", "# nothing\n");
    EXPECT_EQ(value(key), std::nullopt);
    root.addFile("/etc/resolv.conf", std::string(1024 * 1024 + 1, '\n'));
    EXPECT_EQ(value(key), std::nullopt);
}

TEST_F(LocalNetworkStateStoreTest, TheSetupDomainIsWhatIsStored) {
    addPair("eth7");
    const Key key = Key::service(NetworkDomain::Setup, "eth7", NetworkEntity::IPv4);
    EXPECT_EQ(value(key), std::nullopt);
    EXPECT_EQ(configure("eth7", manual("192.0.2.7", "255.255.255.0", "192.0.2.1")), 0);
    EXPECT_EQ(value(key), manual("192.0.2.7", "255.255.255.0", "192.0.2.1"));
}

} // namespace
} // namespace welcomer
