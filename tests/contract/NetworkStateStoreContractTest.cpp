// What the stores of the network tell of its state, whatever they stand on. Each test has a network namespace
// of its own.

#include "tests/contract/NetworkStoresFixture.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace welcomer {
namespace {

class NetworkStateStoreContractTest : public NetworkStoresContract {};

INSTANTIATE_TEST_SUITE_P(Every, NetworkStateStoreContractTest, testing::ValuesIn(networkBackends()),
                         [](const auto& each) { return each.param.name; });

TEST_P(NetworkStateStoreContractTest, AMachineWithoutLinksHasNoState) {
    EXPECT_EQ(globalIPv4(), std::nullopt);
    EXPECT_EQ(serviceIPv4("eth7"), std::nullopt);
    EXPECT_EQ(link("eth7"), std::nullopt);
    EXPECT_EQ(link(""), std::nullopt);
    EXPECT_EQ(link(std::string(300, 'x')), std::nullopt);
    EXPECT_TRUE(interfaces().empty());
}

TEST_P(NetworkStateStoreContractTest, ALinkIsActiveWhileItIsUpAndItsPeerIsToo) {
    shell("ip link add p-seven type veth peer name p-eight");
    EXPECT_EQ(link("p-seven"), active(false));
    shell("ip link set p-seven up");
    EXPECT_EQ(link("p-seven"), active(false));
    shell("ip link set p-eight up");
    EXPECT_EQ(link("p-seven"), active(true));
    shell("ip link set p-seven down");
    EXPECT_EQ(link("p-seven"), active(false));
    shell("ip link set p-seven up && ip link set p-eight down");
    EXPECT_EQ(link("p-seven"), active(false));
}

TEST_P(NetworkStateStoreContractTest, OtherKeysHaveNoValue) {
    addPair("eth7");
    EXPECT_EQ(value(Key::global(NetworkDomain::Setup, NetworkEntity::IPv4)), std::nullopt);
    EXPECT_EQ(value(Key::global(NetworkDomain::State, NetworkEntity::Link)), std::nullopt);
    EXPECT_EQ(value(Key::interface(NetworkDomain::Setup, "eth7", NetworkEntity::Link)), std::nullopt);
    EXPECT_EQ(value(Key::interface(NetworkDomain::State, "eth7", NetworkEntity::IPv4)), std::nullopt);
    EXPECT_EQ(value(Key::service(NetworkDomain::State, "eth7", NetworkEntity::DNS)), std::nullopt);
    EXPECT_EQ(value(Key::service(NetworkDomain::Setup, "eth7", NetworkEntity::Link)), std::nullopt);
}

TEST_P(NetworkStateStoreContractTest, TheServiceThatTheTrafficTakesIsPrimary) {
    addPair("eth7");
    addPair("eth8");
    EXPECT_EQ(configure("eth8", manual("198.51.100.7", "255.255.255.128", "")), 0);
    EXPECT_EQ(globalIPv4(), std::nullopt);
    EXPECT_EQ(configure("eth7", manual("192.0.2.7", "255.255.254.0", "192.0.2.1")), 0);
    const std::string id = idOf("eth7");
    EXPECT_EQ(globalIPv4(), (Dictionary{{"PrimaryService", id}, {"Router", "192.0.2.1"}}));
    EXPECT_EQ(serviceIPv4(id),
              (Dictionary{{"Addresses", Array{"192.0.2.7"}}, {"SubnetMasks", Array{"255.255.254.0"}}}));
    EXPECT_EQ(serviceIPv4(idOf("eth8"))->at("SubnetMasks"), PropertyList(Array{"255.255.255.128"}));
    EXPECT_EQ(value(Key::service(NetworkDomain::Setup, id, NetworkEntity::IPv4)),
              manual("192.0.2.7", "255.255.254.0", "192.0.2.1"));
    EXPECT_EQ(value(Key::service(NetworkDomain::Setup, "no such", NetworkEntity::IPv4)), std::nullopt);
}

TEST_P(NetworkStateStoreContractTest, WithoutServersOfItsOwnTheResolversFileCounts) {
    addPair("eth7");
    EXPECT_EQ(configure("eth7", manual("192.0.2.7", "255.255.255.0", "192.0.2.1")), 0);
    EXPECT_EQ(value(Key::global(NetworkDomain::State, NetworkEntity::DNS)),
              (Dictionary{{"ServerAddresses", Array{"192.0.2.53"}}, {"DomainName", "home.example"}}));
}

} // namespace
} // namespace welcomer
