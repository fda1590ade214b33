// What applying a configuration does to the kernel. Each test has a network namespace of its own.

#include "backends/local/network/KernelApplier.h"
#include "tests/contract/NetworkStoresFixture.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cerrno>
#include <filesystem>
#include <string>
#include <vector>

namespace welcomer {
namespace {

class LocalNetworkApplyTest : public KernelNetworkStores {};

TEST_F(LocalNetworkApplyTest, AManualConfigurationSetsAddressMaskAndRouterAndBringsTheLinkUp) {
    shell("ip link add eth7 type veth peer name peer7");
    EXPECT_EQ(configure("eth7", manual("192.0.2.7", "255.255.254.0", "192.0.2.1")), 0);
    EXPECT_EQ(addresses("eth7"), "192.0.2.7/23\n");
    shell("ip link set peer7 up");
    EXPECT_EQ(defaultRoutes(), "default via 192.0.2.1 dev eth7 proto static\n");
    EXPECT_EQ(link("eth7"), active(true));
}

TEST_F(LocalNetworkApplyTest, WithoutARouterThereIsNoDefaultRouteOfThatDevice) {
    addPair("eth7");
    addPair("eth8");
    shell("ip addr add 198.51.100.7/24 dev eth8 && ip route add default via 198.51.100.1 metric 9");
    shell("ip addr add 192.0.2.9/24 dev eth7 && ip route add default via 192.0.2.1");
    EXPECT_EQ(configure("eth7", manual("192.0.2.7", "255.255.255.0", "")), 0);
    EXPECT_EQ(defaultRoutes(), "default via 198.51.100.1 dev eth8 metric 9\n");
    Dictionary without = manual("192.0.2.7", "255.255.255.0", "");
    without.erase("Router");
    EXPECT_EQ(configure("eth7", without), 0);
}

TEST_F(LocalNetworkApplyTest, TheManualDHCPMethodSetsTheAddressWithTheMaskThatIsThere) {
    addPair("eth7");
    Dictionary inform = manual("192.0.2.7", "255.255.255.0", "192.0.2.1");
    inform["ConfigMethod"] = "INFORM";
    EXPECT_EQ(configure("eth7", inform), 0);
    EXPECT_EQ(addresses("eth7"), "192.0.2.7/24\n");
    inform.erase("SubnetMasks");
    EXPECT_EQ(configure("eth7", inform), 0);
    EXPECT_EQ(addresses("eth7"), "192.0.2.7/24\n"); // which its class has too
}

TEST_F(LocalNetworkApplyTest, OfSeveralServicesThatCannotBeAppliedTheFirstOnesErrorCounts) {
    addPair("eth7");
    addPair("eth8");
    const auto connection = store().open("a test");
    serviceOf(*connection, "eth7")->copyProtocol("IPv4")->setConfiguration(manual("none", "", ""));
    serviceOf(*connection, "eth8")->copyProtocol("IPv4")->setConfiguration({{"ConfigMethod", "Telepathy"}});
    EXPECT_FALSE(connection->commitChanges());
    EXPECT_EQ(connection->lastErrorCode(), platform::kNetworkConfigInvalid);
    connection->synchronize();
    const Dictionary good = manual("192.0.2.7", "255.255.255.0", "");
    serviceOf(*connection, "eth7")->copyProtocol("IPv4")->setConfiguration(good);
    serviceOf(*connection, "eth8")->copyProtocol("IPv4")->setConfiguration({{"ConfigMethod", "DHCP"}});
    shell("ip link del eth7");
    EXPECT_TRUE(connection->commitChanges());
    EXPECT_FALSE(connection->applyChanges()); // nor is there a DHCP client
    EXPECT_EQ(connection->lastErrorCode(), platform::kNetworkConfigNoDevice);
    EXPECT_EQ(connection->lastErrorText(), "there is no such network device (eth7)");
}

TEST_F(LocalNetworkApplyTest, ARouterThatTheKernelRefusesIsAnErrorAndTheAddressesStay) {
    addPair("eth7");
    shell("ip addr add 10.0.0.9/8 dev eth7 && ip route add default via 10.0.0.1");
    network::IPv4Configuration unchecked;
    unchecked.method = network::IPv4Configuration::Method::Manual;
    unchecked.address = *network::parseIPv4("192.0.2.7");
    unchecked.prefixLength = 24;
    unchecked.router = network::parseIPv4("198.51.100.1");
    std::string detail;
    const std::int32_t status =
        local::KernelApplier(posix::RootFolder(root.path())).apply(unchecked, "eth7", detail);
    EXPECT_EQ(status, platform::kNetworkConfigKernelRefused + ENETUNREACH);
    EXPECT_EQ(platform::networkConfigStatusText(status), "the kernel refused: Network is unreachable");
    EXPECT_EQ(detail, "eth7");
    EXPECT_EQ(addresses("eth7"), "10.0.0.9/8\n");
    EXPECT_EQ(defaultRoutes(), "default via 10.0.0.1 dev eth7\n");
}

TEST_F(LocalNetworkApplyTest, ARouterThatTheKernelWouldRefuseIsRefusedBeforeAndTheAddressesStay) {
    addPair("eth7");
    shell("ip addr add 10.0.0.9/8 dev eth7 && ip route add default via 10.0.0.1");
    EXPECT_EQ(refusal("eth7", manual("192.0.2.7", "255.255.255.0", "198.51.100.1")),
              platform::kNetworkConfigInvalid);
    EXPECT_EQ(errorText, "an address, a subnet mask, a router or a name server is missing or makes no sense "
                         "(eth7: router \"198.51.100.1\")");
    EXPECT_EQ(addresses("eth7"), "10.0.0.9/8\n");
    EXPECT_EQ(defaultRoutes(), "default via 10.0.0.1 dev eth7\n");
}

TEST_F(LocalNetworkApplyTest, NameServersGoToTheResolversFileWhichKeepsItsOtherLines) {
    addPair("eth7");
    const Dictionary ipv4 = manual("192.0.2.7", "255.255.255.0", "");
    EXPECT_EQ(
        configure("eth7", ipv4, {{"ServerAddresses", Array{"192.0.2.1  ", "2001:db8::1", "fe80::1%eth7"}}}),
        0);
    EXPECT_EQ(root.content("/etc/resolv.conf"),
              "# kept\nnameserver 192.0.2.1\nnameserver 2001:db8::1\nnameserver fe80::1%eth7\n"
              "search home.example other.example\n");
    EXPECT_EQ(configure("eth7", ipv4, {{"DomainName", "home.example"}}), 0); // no servers: left alone
    EXPECT_NE(root.content("/etc/resolv.conf")->find("192.0.2.1"), std::string::npos);
}

TEST_F(LocalNetworkApplyTest, NameServersThatAreNoneAreRefusedBeforeAnythingIsChanged) {
    addPair("eth7");
    const std::string before = *root.content("/etc/resolv.conf");
    for (const char* bad :
         {"no address", "", "192.0.2.1\noptions debug", "1.2.3", "::1%", "::1%a b", "\t192.0.2.1"}) {
        EXPECT_EQ(refusal("eth7", manual("192.0.2.7", "255.255.255.0", ""),
                          {{"ServerAddresses", Array{"192.0.2.1", bad}}}),
                  platform::kNetworkConfigInvalid)
            << bad;
    }
    EXPECT_EQ(root.content("/etc/resolv.conf"), before);
    EXPECT_EQ(addresses("eth7"), "\n");
}

TEST_F(LocalNetworkApplyTest, AResolversFileThatIsALinkIsAnothersAndLeftAlone) {
    addPair("eth7");
    root.addFile("/run/other/resolv.conf", "nameserver 192.0.2.99\n");
    std::filesystem::remove(root.locate("/etc/resolv.conf"));
    std::filesystem::create_symlink("../run/other/resolv.conf", root.locate("/etc/resolv.conf"));
    EXPECT_EQ(configure("eth7", manual("192.0.2.7", "255.255.255.0", ""),
                        {{"ServerAddresses", Array{"192.0.2.1"}}}),
              platform::kNetworkConfigNameServersElsewhere);
    EXPECT_EQ(root.content("/run/other/resolv.conf"), "nameserver 192.0.2.99\n");
}

TEST_F(LocalNetworkApplyTest, AMissingResolversFileIsMadeAndOneThatCannotBeWrittenIsAnError) {
    addPair("eth7");
    const Dictionary servers = {{"ServerAddresses", Array{"192.0.2.1"}}};
    std::filesystem::remove(root.locate("/etc/resolv.conf"));
    EXPECT_EQ(configure("eth7", manual("192.0.2.7", "255.255.255.0", ""), servers), 0);
    EXPECT_EQ(root.content("/etc/resolv.conf"), "nameserver 192.0.2.1\n");
    std::filesystem::remove(root.locate("/etc/resolv.conf"));
    root.addDirectory("/etc/resolv.conf");
    EXPECT_EQ(configure("eth7", manual("192.0.2.7", "255.255.255.0", ""), servers),
              platform::kNetworkConfigNameServersNotWritten);
}

TEST_F(LocalNetworkApplyTest, TenThousandNameServersAreWritten) {
    addPair("eth7");
    EXPECT_EQ(configure("eth7", manual("192.0.2.7", "255.255.255.0", ""),
                        {{"ServerAddresses", Array(10000, "192.0.2.1")}}),
              0);
    const std::string text = *root.content("/etc/resolv.conf");
    EXPECT_EQ(std::ranges::count(text, '\n'), 10002);
}

TEST_F(LocalNetworkApplyTest, TheLinkLocalMethodAndNoMethodConfigureNothing) {
    addPair("eth7");
    shell("ip addr add 10.0.0.9/8 dev eth7");
    EXPECT_EQ(configure("eth7", {{"ConfigMethod", "LinkLocal"}}), 0);
    EXPECT_EQ(configure("eth7", Dictionary()), 0);
    EXPECT_EQ(addresses("eth7"), "10.0.0.9/8\n");
}

} // namespace
} // namespace welcomer
