// Applying on a real NetworkManager.

#include "tests/integration/networkmanager/NetworkManagerFixture.h"
#include "tests/support/NetworkNamespace.h"

#include <sys/wait.h>
#include <thread>
#include <unistd.h>

namespace welcomer {
namespace {

TEST_F(NetworkManagerTest, ADeviceThatRunsTheProfileKeepsRunningIt) {
    addCable("eth7");
    EXPECT_EQ(configure("eth7", manual("192.0.2.7")), 0);
    const std::string before = activation(idOf("eth7"));
    EXPECT_EQ(configure("eth7", manual("192.0.2.8", "192.0.2.1")), 0);
    EXPECT_EQ(addresses("eth7"), "192.0.2.8/24");
    EXPECT_EQ(trimmed(shell("ip -4 route show default | sed 's/ metric.*//'")),
              "default via 192.0.2.1 dev eth7 proto static");
    EXPECT_EQ(activation(idOf("eth7")), before);
}

TEST_F(NetworkManagerTest, ADeviceThatRunsAnotherProfileOrNoneActivatesIt) {
    addCable("eth7");
    shell("nmcli connection add type ethernet con-name One ifname eth7 autoconnect no "
          "ipv4.method manual ipv4.addresses 192.0.2.9/24");
    EXPECT_EQ(configure("eth7", manual("192.0.2.7")), 0);
    EXPECT_EQ(addresses("eth7"), "192.0.2.7/24");
    shell("nmcli connection add type ethernet con-name Two ifname eth7 autoconnect no "
          "ipv4.method manual ipv4.addresses 192.0.2.10/24");
    const auto connection = store.open("a test");
    shell("nmcli connection up Two");
    serviceOf(*connection, "eth7")->copyProtocol("IPv4")->setConfiguration(manual("192.0.2.8"));
    EXPECT_TRUE(connection->commitChanges());
    EXPECT_TRUE(connection->applyChanges());
    EXPECT_EQ(addresses("eth7"), "192.0.2.8/24");
    EXPECT_EQ(profile("One", "GENERAL.STATE"), "activated");
}

TEST_F(NetworkManagerTest, DHCPTakesTheAddressThatTheNetworkGivesAndTheOldOneIsGoneAtOnce) {
    addCable("eth7");
    serveAddresses("eth7");
    const std::string hasLease = "ip -4 addr show dev eth7 | grep -q 192.0.2.5";
    EXPECT_EQ(configure("eth7", {{"ConfigMethod", "DHCP"}}), 0);
    waitFor(hasLease);
    EXPECT_EQ(configure("eth7", manual("192.0.2.7")), 0);
    EXPECT_EQ(addresses("eth7"), "192.0.2.7/24");
    EXPECT_EQ(configure("eth7", {{"ConfigMethod", "DHCP"}}), 0);
    EXPECT_EQ(addresses("eth7").find("192.0.2.7"), std::string::npos);
    waitFor(hasLease);
}

TEST_F(NetworkManagerTest, DHCPWithoutAnAnswerIsNoFailureAndTheOldAddressIsGone) {
    addCable("eth7");
    for (const char* method : {"DHCP", "BOOTP"}) {
        EXPECT_EQ(configure("eth7", manual("192.0.2.7", "192.0.2.1")), 0);
        EXPECT_EQ(addresses("eth7"), "192.0.2.7/24");
        EXPECT_EQ(configure("eth7", {{"ConfigMethod", method}}), 0) << method; // a profile that it runs
        EXPECT_EQ(addresses("eth7"), "") << method;
        EXPECT_EQ(shell("ip -4 route show default"), "") << method;
        EXPECT_EQ(configure("eth7", {{"ConfigMethod", method}}), 0) << method; // and is still asking with
        shell("nmcli device disconnect eth7 && ip addr add 192.0.2.7/24 dev eth7 && ip link set eth7 up");
        EXPECT_EQ(configure("eth7", {{"ConfigMethod", method}}), 0) << method; // from another one
        EXPECT_EQ(addresses("eth7"), "") << method;
        EXPECT_EQ(ipv4("eth7").at("ConfigMethod"), PropertyList(method));
    }
}

TEST_F(NetworkManagerTest, DHCPWithoutACableIsRefusedAndTheProfileStays) {
    addCable("eth7", false);
    EXPECT_EQ(configure("eth7", {{"ConfigMethod", "DHCP"}}), platform::kNetworkConfigNotActivated);
    EXPECT_EQ(errorText, "the network did not come up with this configuration");
    EXPECT_EQ(profile(idOf("eth7"), "ipv4.method"), "auto");
}

TEST_F(NetworkManagerTest, ManualDHCPKeepsItsAddressThoughNoServerAnswers) {
    addCable("eth7");
    EXPECT_EQ(configure("eth7", manual("192.0.2.7")), 0);
    const std::string id = idOf("eth7");
    shell("nmcli connection modify " + id + " ipv6.method disabled");
    Dictionary inform = manual("192.0.2.8", "192.0.2.1");
    inform["ConfigMethod"] = "INFORM";
    EXPECT_EQ(configure("eth7", inform), 0);
    EXPECT_EQ(addresses("eth7"), "192.0.2.8/24");
    EXPECT_EQ(profile(id, "ipv4.method,ipv4.addresses,ipv4.gateway,ipv4.may-fail,ipv6.method,ipv6.may-fail"),
              "auto\n192.0.2.8/24\n192.0.2.1\nyes\nlink-local\nyes");
    EXPECT_EQ(ipv4("eth7"), inform);
    shell("nmcli connection down " + id);
    EXPECT_EQ(configure("eth7", inform), 0); // the same from an inactive device
    EXPECT_EQ(addresses("eth7"), "192.0.2.8/24");
    EXPECT_EQ(configure("eth7", manual("192.0.2.7")), 0);
    EXPECT_EQ(profile(id, "ipv6.method"), "disabled"); // as it was before
}

TEST_F(NetworkManagerTest, ManualDHCPTakesBothAddressesWhereAServerAnswers) {
    addCable("eth7");
    serveAddresses("eth7");
    EXPECT_EQ(configure("eth7", {{"ConfigMethod", "INFORM"}, {"Addresses", Array{"192.0.2.7"}}}), 0);
    waitFor("ip -4 addr show dev eth7 | grep -q 192.0.2.5");
    EXPECT_NE(addresses("eth7").find("192.0.2.7/24"), std::string::npos);
}

TEST_F(NetworkManagerTest, TheLinkLocalMethodHasTheMachinePickAnAddress) {
    addCable("eth7");
    EXPECT_EQ(configure("eth7", {{"ConfigMethod", "LinkLocal"}}, {{"ServerAddresses", Array{"192.0.2.53"}}}),
              0);
    EXPECT_EQ(addresses("eth7").substr(0, 8), "169.254.");
    EXPECT_EQ(ipv4("eth7"), (Dictionary{{"ConfigMethod", "LinkLocal"}}));
    EXPECT_EQ(serviceOf(*store.open("a test"), "eth7")->copyProtocol("DNS")->configuration(),
              (Dictionary{{"ServerAddresses", Array{"192.0.2.53"}}}));
}

TEST_F(NetworkManagerTest, TheEndOfNetworkManagerOrTheBusIsAnErrorAndNoMore) {
    addCable("eth7");
    EXPECT_EQ(configure("eth7", manual("192.0.2.7")), 0);
    const auto connection = store.open("a test");
    const auto service = serviceOf(*connection, "eth7");
    service->copyProtocol("IPv4")->setConfiguration(manual("192.0.2.8"));
    EXPECT_TRUE(connection->commitChanges());
    daemon->stop();
    EXPECT_FALSE(connection->applyChanges());
    service->copyProtocol("IPv4")->setConfiguration(manual("192.0.2.9"));
    EXPECT_FALSE(connection->commitChanges());
    EXPECT_NE(connection->lastErrorCode(), 0);
    daemon->stopBus();
    EXPECT_FALSE(connection->commitChanges());
    EXPECT_NE(connection->lastErrorCode(), 0);
    connection->synchronize();
    EXPECT_NE(store.open("a test")->copyCurrentSet(), nullptr); // the kernel's
}

TEST_F(NetworkManagerTest, TheEndOfNetworkManagerEndsTheWait) {
    addCable("eth7"); // where no IPv6 router answers
    shell("nmcli connection add type ethernet con-name One ifname eth7 autoconnect no ipv4.method auto "
          "ipv6.method auto ipv6.may-fail no ipv6.ra-timeout infinity");
    const auto connection = store.open("a test");
    serviceOf(*connection, "eth7")->copyProtocol("IPv4")->setConfiguration(manual("192.0.2.7"));
    EXPECT_TRUE(connection->commitChanges());
    std::thread ending([&] {
        waitFor("nmcli -g GENERAL.STATE connection show One | grep -q activating");
        daemon->stop();
    });
    EXPECT_FALSE(connection->applyChanges());
    EXPECT_EQ(connection->lastErrorCode(), platform::kNetworkConfigNotActivated);
    ending.join();
}

TEST_F(NetworkManagerTest, AnOrdinaryUserReadsEverythingAndIsRefusedToChangeAnything) {
    addCable("eth7");
    const auto inChild = [](const std::function<int()>& act) {
        const pid_t child = ::fork();
        if (child == 0) {
            ::_exit(act());
        }
        int status = -1;
        ::waitpid(child, &status, 0);
        return status;
    };
    ASSERT_EQ(inChild([&] { return configure("eth7", manual("192.0.2.7", "192.0.2.1")) == 0 ? 0 : 1; }), 0);
    const int status = inChild([&] {
        constexpr uid_t kNobody = 65534;
        if (::setgid(kNobody) != 0 || ::setuid(kNobody) != 0) {
            return 1;
        }
        if (globalIPv4()->at("Router") != PropertyList("192.0.2.1") ||
            ipv4("eth7").at("ConfigMethod") != PropertyList("Manual")) {
            return 2;
        }
        const auto connection = store.open("a test");
        serviceOf(*connection, "eth7")->copyProtocol("IPv4")->setConfiguration(manual("192.0.2.8"));
        const bool isRefused = !connection->commitChanges() &&
                               connection->lastErrorCode() == platform::kNetworkConfigAccessDenied;
        return isRefused ? 0 : 3;
    });
    EXPECT_EQ(status, 0);
    EXPECT_EQ(addresses("eth7"), "192.0.2.7/24");
}

} // namespace
} // namespace welcomer
