// State, the tool and reachability on a real NetworkManager.

#include "backends/desktop/DesktopNetwork.h"
#include "tests/integration/networkmanager/NetworkManagerFixture.h"
#include "tests/support/NetworkNamespace.h"

#include <vector>

namespace welcomer {
namespace {

// State

TEST_F(NetworkManagerTest, StateComesFromThePrimaryConnection) {
    addCable("eth7");
    addCable("eth8");
    neighbour->shell("ip addr add 198.51.100.1/24 dev p-eth8");
    EXPECT_EQ(configure("eth7", manual("192.0.2.7", "192.0.2.1"), {{"ServerAddresses", Array{"192.0.2.53"}}}),
              0);
    const std::string first = idOf("eth7");
    EXPECT_EQ(globalIPv4(), (Dictionary{{"PrimaryService", first}, {"Router", "192.0.2.1"}}));
    shell("nmcli connection add type ethernet con-name Two ifname eth8 autoconnect no ipv4.method manual "
          "ipv4.addresses 198.51.100.7/23,198.51.100.8/24 ipv4.gateway 198.51.100.1 ipv4.route-metric 5 "
          "ipv4.dns 198.51.100.53 ipv4.dns-search office.example ipv6.method manual "
          "ipv6.addresses 2001:db8::7/64 ipv6.dns 2001:db8::53");
    shell("nmcli connection up Two");
    const std::string second = profile("Two", "connection.uuid");
    const auto connection = stateStore.open("a test");
    EXPECT_EQ(connection->copyValue(Key::global(NetworkDomain::State, NetworkEntity::IPv4)),
              (Dictionary{{"PrimaryService", second}, {"Router", "198.51.100.1"}}));
    EXPECT_EQ(connection->copyValue(Key::global(NetworkDomain::State, NetworkEntity::DNS)),
              (Dictionary{{"ServerAddresses", Array{"198.51.100.53", "2001:db8::53"}},
                          {"DomainName", "office.example"}}));
    EXPECT_EQ(connection->copyValue(Key::service(NetworkDomain::State, second, NetworkEntity::IPv4)),
              (Dictionary{{"Addresses", Array{"198.51.100.7", "198.51.100.8"}},
                          {"SubnetMasks", Array{"255.255.254.0", "255.255.255.0"}}}));
    EXPECT_EQ(connection->copyValue(Key::service(NetworkDomain::State, first, NetworkEntity::IPv4)),
              (Dictionary{{"Addresses", Array{"192.0.2.7"}}, {"SubnetMasks", Array{"255.255.255.0"}}}));
    const auto setup = connection->copyValue(Key::service(NetworkDomain::Setup, second, NetworkEntity::IPv4));
    EXPECT_EQ(setup->at("ConfigMethod"), PropertyList("Manual"));
    EXPECT_EQ(connection->copyValue(Key::service(NetworkDomain::Setup, first, NetworkEntity::IPv4)),
              manual("192.0.2.7", "192.0.2.1"));
    EXPECT_EQ(connection->copyValue(Key::service(NetworkDomain::Setup, "no such", NetworkEntity::IPv4)),
              std::nullopt);
    EXPECT_EQ(connection->copyValue(Key::interface(NetworkDomain::State, "eth7", NetworkEntity::Link)),
              (Dictionary{{"Active", true}}));
    shell("nmcli connection down Two");
    EXPECT_EQ(connection->copyValue(Key::service(NetworkDomain::State, second, NetworkEntity::IPv4)),
              std::nullopt);
}

TEST_F(NetworkManagerTest, WhatNetworkManagerKnowsNothingOfIsAskedOfTheKernel) {
    shell("ip link add p-one type veth peer name p-two && ip addr add 192.0.2.7/24 dev p-one && "
          "ip link set p-one up && ip link set p-two up && ip route add default via 192.0.2.1");
    root.addFile("/etc/resolv.conf", "nameserver 192.0.2.53\n");
    EXPECT_EQ(globalIPv4(), (Dictionary{{"PrimaryService", "p-one"}, {"Router", "192.0.2.1"}}));
    EXPECT_EQ(value(Key::service(NetworkDomain::State, "p-one", NetworkEntity::IPv4))->at("Addresses"),
              PropertyList(Array{"192.0.2.7"}));
    EXPECT_EQ(value(Key::global(NetworkDomain::State, NetworkEntity::DNS)),
              (Dictionary{{"ServerAddresses", Array{"192.0.2.53"}}}));
}

TEST_F(NetworkManagerTest, WithoutNetworkManagerTheKernelServes) {
    addCable("eth7");
    shell("ip addr add 192.0.2.7/24 dev eth7 && ip link set eth7 up && ip route add default via 192.0.2.1");
    const auto servesAsTheKernel = [&] {
        const auto connection = store.open("a test");
        const bool isEstablished = connection->copyCurrentSet()->establishDefaultConfiguration();
        EXPECT_EQ(serviceOf(*connection, "eth7")->serviceID(), "eth7");
        EXPECT_FALSE(serviceOf(*connection, "eth7")->addProtocolType("IPv4"));
        EXPECT_EQ(connection->lastErrorCode(), platform::kNetworkConfigAlreadyThere);
        EXPECT_EQ(globalIPv4(), (Dictionary{{"PrimaryService", "eth7"}, {"Router", "192.0.2.1"}}));
        EXPECT_EQ(reachability.createTarget("192.0.2.1")->flags(), platform::kHostReachable);
        return isEstablished;
    };
    daemon->stop();
    EXPECT_TRUE(servesAsTheKernel());
    daemon->stopBus();
    EXPECT_TRUE(servesAsTheKernel());
}

TEST_F(NetworkManagerTest, TheReportsSayWhoServesAndWhatWouldBeNeeded) {
    std::vector<platform::BackendReport> reports = network.reports();
    ASSERT_EQ(reports.size(), 3U);
    for (const platform::BackendReport& report : reports) {
        EXPECT_EQ(report.backend, "NetworkManager") << report.interface;
        EXPECT_EQ(report.reason.substr(0, 15), "NetworkManager ");
        EXPECT_EQ(report.advice, "");
    }
    EXPECT_EQ(reports[0].interface, "NetworkConfigStore");
    daemon->hold(true);
    reports = network.reports();
    daemon->hold(false);
    for (const platform::BackendReport& report : reports) {
        EXPECT_EQ(report.backend, "NetworkManager") << report.interface;
        EXPECT_EQ(report.reason, "NetworkManager runs, does not answer");
        EXPECT_NE(report.advice, "");
    }
    daemon->stop();
    waitFor("test -z \"$(nmcli -t -f RUNNING general | grep running$ | grep -v not)\"");
    reports = network.reports();
    EXPECT_EQ(reports[0].backend, "local file and kernel");
    EXPECT_EQ(reports[1].backend, "kernel");
    EXPECT_EQ(reports[2].backend, "name lookup and routes");
    EXPECT_EQ(reports[2].reason, "NetworkManager does not run");
    EXPECT_NE(reports[2].advice, "");
}

TEST_F(NetworkManagerTest, WithoutTheModuleTheKernelServes) {
    shell("ip link add p-one type veth peer name p-two");
    desktop::DesktopNetwork bare({kernelStore, kernelStateStore, kernelReachability},
                                 {nullptr, root.locate("/no modules")});
    EXPECT_EQ(bare.configStore().open("a test")->copyCurrentSet()->copyServices()->size(), 2U);
    EXPECT_EQ(bare.configStore().copyInterfaces().size(), 2U);
    EXPECT_EQ(bare.stateStore().open("a test")->copyValue(
                  Key::interface(NetworkDomain::State, "p-one", NetworkEntity::Link)),
              (Dictionary{{"Active", false}}));
    EXPECT_EQ(bare.hostReachability().createTarget("127.0.0.1")->flags(), platform::kHostReachable);
    EXPECT_EQ(bare.reports()[0].backend, "local file and kernel");
}

// The tool

TEST_F(NetworkManagerTest, TheToolAppliesAndShowsWhatTheUserChose) {
    addCable("eth7");
    const std::string tool = WELCOMER_TOOL " network ";
    shell(tool +
          "apply --choice lan --method Manual --ip 192.0.2.7 --subnet 255.255.255.0 --router 192.0.2.1 "
          "--dns 192.0.2.53 --warning-type 3");
    EXPECT_EQ(addresses("eth7"), "192.0.2.7/24");
    EXPECT_EQ(
        profile(idOf("eth7"), "ipv4.method,ipv4.addresses,ipv4.gateway,ipv4.dns,connection.autoconnect"),
        "manual\n192.0.2.7/24\n192.0.2.1\n192.0.2.53\nyes");
    EXPECT_EQ(shell(tool + "show"), "Method:          Manual\n"
                                    "Address:         192.0.2.7\n"
                                    "Subnet mask:     255.255.255.0\n"
                                    "Router:          192.0.2.1\n"
                                    "DNS servers:     192.0.2.53\n"
                                    "Search domains:  -\n");
    shell(tool + "apply --choice lan --method 'Manual DHCP' --ip 192.0.2.8 --warning-type 3");
    EXPECT_EQ(addresses("eth7"), "192.0.2.8/24"); // the mask of before
    serveAddresses("eth7");
    shell(tool + "apply --choice lan --method DHCP --warning-type 3");
    waitFor("ip -4 addr show dev eth7 | grep -q 192.0.2.5");
    EXPECT_NE(shell(tool + "show").find("Method:          DHCP\n"), std::string::npos);
}

TEST_F(NetworkManagerTest, TheToolRegistersServicesForNewDevices) {
    addCable("eth7");
    EXPECT_NE(shell(WELCOMER_TOOL " network register").find("Ethernet (eth7)"), std::string::npos);
    EXPECT_EQ(profiles(), "Ethernet (eth7)");
}

// Reachability

class PortalTest : public NetworkManagerTest {
  protected:
    void startDaemon() override { daemon.emplace("http://192.0.2.1:8080/check"); }

    // A web server at the other end that answers every request with this.
    void answer(const std::string& status, const std::string& body) {
        stopProgram(server);
        root.addFile("/server.py",
                     "import http.server\n"
                     "class Handler(http.server.BaseHTTPRequestHandler):\n"
                     "    def do_GET(self):\n"
                     "        self.send_response(" +
                         status +
                         ")\n"
                         "        self.send_header('Location', 'http://192.0.2.1:8080/portal')\n"
                         "        self.end_headers()\n"
                         "        self.wfile.write(b'" +
                         body +
                         "')\n"
                         "http.server.HTTPServer(('', 8080), Handler).serve_forever()\n");
        server = neighbour->start("python3 " + root.locate("/server.py") + " 2>/dev/null");
        waitFor("python3 -c 'import socket; socket.create_connection((\"192.0.2.1\", 8080))'");
    }

    void TearDown() override {
        NetworkManagerTest::TearDown();
        stopProgram(server);
    }

    pid_t server = -1;
};

TEST_F(PortalTest, AHostBehindACaptivePortalNeedsAConnectionUntilThePortalIsPassed) {
    addCable("eth7");
    ASSERT_EQ(configure("eth7", manual("192.0.2.7", "192.0.2.1")), 0);
    const auto target = reachability.createTarget("203.0.113.1");
    answer("302", "");
    EXPECT_EQ(target->flags(), platform::kHostReachable | platform::kHostConnectionRequired);
    answer("200", "log in first");
    EXPECT_EQ(target->flags(), platform::kHostReachable | platform::kHostConnectionRequired);
    answer("200", "no portal here");
    EXPECT_EQ(target->flags(), platform::kHostReachable); // at once, though a portal is remembered
    EXPECT_EQ(reachability.createTarget("no such host.invalid")->flags().value_or(0), 0U);
}

TEST_F(NetworkManagerTest, WithoutAPlaceToLookThereIsNoPortal) {
    addCable("eth7");
    ASSERT_EQ(configure("eth7", manual("192.0.2.7", "192.0.2.1")), 0);
    EXPECT_EQ(reachability.createTarget("203.0.113.1")->flags(), platform::kHostReachable);
}

} // namespace
} // namespace welcomer
