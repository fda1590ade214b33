// What the tests on a real NetworkManager share.

#pragma once

#include "backends/desktop/DesktopNetwork.h"
#include "backends/local/network/LocalHostReachability.h"
#include "backends/local/network/LocalNetworkConfigStore.h"
#include "backends/local/network/LocalNetworkStateStore.h"
#include "tests/contract/TemporaryRoot.h"
#include "tests/support/MountNamespace.h"
#include "tests/support/NetworkManagerDaemon.h"
#include "tests/support/NetworkNamespace.h"

#include <gtest/gtest.h>

namespace welcomer {

using Dictionary = PropertyList::Dictionary;
using Array = PropertyList::Array;
using Key = platform::NetworkStateKey;
using platform::NetworkDomain;
using platform::NetworkEntity;

class NetworkManagerTest : public testing::Test {
  protected:
    void SetUp() override {
        if (!mayHaveNetwork() || !mayMount()) {
            GTEST_SKIP() << "needs the right to make network and mount namespaces";
        }
        enterNetworkNamespace();
        enterMountNamespace();
        neighbour.emplace();
        startDaemon();
    }

    void TearDown() override {
        if (HasFailure()) {
            std::cout << shell("cat /run/manager.log");
        }
    }

    // A test of its own way of starting replaces this.
    virtual void startDaemon() { daemon.emplace(); }

    // A cable into the neighbour's network; its end there is 192.0.2.1.
    void addCable(const std::string& device, bool isPluggedIn = true) {
        shell("ip link add " + device + " type veth peer name p-" + device);
        neighbour->take("p-" + device);
        neighbour->shell("ip addr add 192.0.2.1/24 dev p-" + device);
        if (isPluggedIn) {
            plugIn(device);
        }
        waitForManaged(device);
    }
    void plugIn(const std::string& device) { neighbour->shell("ip link set p-" + device + " up"); }

    // A DHCP server at the other end, which hands out 192.0.2.50 to 59.
    void serveAddresses(const std::string& device) {
        neighbour->start(
            "dnsmasq --keep-in-foreground --conf-file=/dev/null --port=0 --no-ping --interface=p-" + device +
            " --bind-interfaces --dhcp-range=192.0.2.50,192.0.2.59,1h "
            "--dhcp-option=option:dns-server,192.0.2.53 --domain=home.example "
            "--dhcp-leasefile=/run/leases --pid-file --user=root --dhcp-authoritative");
        waitFor(neighbour->command("grep -q :0043 /proc/self/net/udp")); // it listens
    }

    static std::string trimmed(std::string text) {
        text.erase(text.find_last_not_of(" \n") + 1);
        return text;
    }
    static std::string profile(const std::string& id, const std::string& field) {
        return trimmed(shell("nmcli -g " + field + " connection show " + id));
    }
    // The names of all profiles but that of the loopback, which NetworkManager finds.
    static std::string profiles() {
        return trimmed(shell("nmcli -g NAME connection show | grep -v '^lo$' || true"));
    }
    static std::string addresses(const std::string& device) {
        return trimmed(shell("ip -4 -o addr show dev " + device + " | awk '{print $4}' | xargs"));
    }
    // What tells one activation from the next.
    static std::string activation(const std::string& id) { return profile(id, "GENERAL.DBUS-PATH"); }

    static std::shared_ptr<platform::NetworkService> serviceOf(platform::NetworkConfigConnection& connection,
                                                               const std::string& device) {
        const auto services = connection.copyCurrentSet()->copyServices();
        for (const auto& each : *services) {
            if (each->interface()->deviceName() == device) {
                return each;
            }
        }
        throw std::runtime_error("no service of " + device);
    }
    std::string idOf(const std::string& device) {
        return *serviceOf(*store.open("a test"), device)->serviceID();
    }
    Dictionary ipv4(const std::string& device) {
        return serviceOf(*store.open("a test"), device)->copyProtocol("IPv4")->configuration().value();
    }
    std::int32_t configure(const std::string& device, const Dictionary& ipv4, const Dictionary& dns = {}) {
        const auto connection = store.open("a test");
        const auto service = serviceOf(*connection, device);
        EXPECT_TRUE(service->copyProtocol("IPv4")->setConfiguration(ipv4));
        if (!dns.empty()) {
            EXPECT_TRUE(service->copyProtocol("DNS")->setConfiguration(dns));
        }
        EXPECT_TRUE(connection->commitChanges()) << connection->lastErrorText();
        const bool isApplied = connection->applyChanges();
        EXPECT_EQ(isApplied, connection->lastErrorCode() == 0);
        errorText = connection->lastErrorText();
        return connection->lastErrorCode();
    }
    // The same, where committing must be refused.
    std::int32_t refusal(const std::string& device, const Dictionary& ipv4, const Dictionary& dns = {}) {
        const auto connection = store.open("a test");
        const auto service = serviceOf(*connection, device);
        EXPECT_TRUE(service->copyProtocol("IPv4")->setConfiguration(ipv4));
        if (!dns.empty()) {
            EXPECT_TRUE(service->copyProtocol("DNS")->setConfiguration(dns));
        }
        EXPECT_FALSE(connection->commitChanges());
        return connection->lastErrorCode();
    }
    static Dictionary manual(const std::string& address, const std::string& router = "") {
        return {{"ConfigMethod", "Manual"},
                {"Addresses", Array{address}},
                {"SubnetMasks", Array{"255.255.255.0"}},
                {"Router", router}};
    }

    std::optional<Dictionary> value(const Key& key) { return stateStore.open("a test")->copyValue(key); }
    std::optional<Dictionary> globalIPv4() {
        return value(Key::global(NetworkDomain::State, NetworkEntity::IPv4));
    }

    TemporaryRoot root;
    local::LocalNetworkConfigStore kernelStore{posix::RootFolder(root.path())};
    local::LocalNetworkStateStore kernelStateStore{posix::RootFolder(root.path())};
    local::LocalHostReachability kernelReachability;
    desktop::DesktopNetwork network{{kernelStore, kernelStateStore, kernelReachability},
                                    {nullptr, kNetworkModules}};
    platform::NetworkConfigStore& store = network.configStore();
    platform::NetworkStateStore& stateStore = network.stateStore();
    platform::HostReachability& reachability = network.hostReachability();
    std::optional<NeighbourNetwork> neighbour;
    std::optional<NetworkManagerDaemon> daemon;
    std::string errorText; // of the last configuration
};

} // namespace welcomer
