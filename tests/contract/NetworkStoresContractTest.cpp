// What the stores of the network do, whatever they stand on, and what those on the kernel do besides. Each
// test has a network namespace of its own.

#include "tests/contract/NetworkBackends.h"
#include "tests/contract/TemporaryRoot.h"
#include "tests/support/NetworkNamespace.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cerrno>
#include <filesystem>
#include <string>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>
#include <vector>

namespace welcomer {
namespace {

using Dictionary = PropertyList::Dictionary;
using Array = PropertyList::Array;
using Key = platform::NetworkStateKey;
using platform::NetworkDomain;
using platform::NetworkEntity;

const std::string kFile = "/var/lib/welcomer/network.plist";

class NetworkStoresFixture : public testing::Test {
  protected:
    void start(const NetworkBackendMaker& make) {
        if (!mayHaveNetwork()) {
            GTEST_SKIP() << "needs the right to make a network namespace";
        }
        enterNetworkNamespace();
        backend = make(root);
        root.addFile("/etc/resolv.conf",
                     "# kept\nnameserver 192.0.2.53\nsearch home.example other.example\n");
    }

    std::optional<Dictionary> value(const Key& key) {
        return backend->stateStore().open("a test")->copyValue(key);
    }
    std::optional<Dictionary> globalIPv4() {
        return value(Key::global(NetworkDomain::State, NetworkEntity::IPv4));
    }
    std::optional<Dictionary> serviceIPv4(const std::string& id) {
        return value(Key::service(NetworkDomain::State, id, NetworkEntity::IPv4));
    }
    std::optional<Dictionary> link(const std::string& device) {
        return value(Key::interface(NetworkDomain::State, device, NetworkEntity::Link));
    }
    static Dictionary active(bool isActive) { return {{"Active", isActive}}; }

    // Each interface as "type device name", with "> " and what it stands on.
    static std::string shown(platform::NetworkInterface* interface) {
        std::string text;
        for (; interface; interface = interface->underlyingInterface()) {
            text += (text.empty() ? "" : " > ") + interface->type().value_or("none") + " " +
                    interface->deviceName().value_or("none");
        }
        return text;
    }
    std::vector<std::string> interfaces() {
        std::vector<std::string> all;
        for (const auto& each : store().copyInterfaces()) {
            all.push_back(shown(each.get()));
        }
        return all;
    }

    std::shared_ptr<platform::NetworkService> serviceOf(platform::NetworkConfigConnection& connection,
                                                        const std::string& device) {
        const auto set = connection.copyCurrentSet();
        const auto services = set ? set->copyServices() : std::nullopt;
        if (!services) {
            return nullptr;
        }
        for (const auto& each : *services) {
            if (each->interface()->deviceName() == device) {
                return each;
            }
        }
        return nullptr;
    }

    // Sets the protocols of a device's service, commits and applies.
    //  result  the last error of what failed, or 0
    std::int32_t configure(const std::string& device, const Dictionary& ipv4, const Dictionary& dns = {}) {
        const auto connection = store().open("a test");
        const auto service = serviceOf(*connection, device);
        if (!service) {
            ADD_FAILURE() << "no service of " << device;
            return -1;
        }
        EXPECT_TRUE(service->copyProtocol("IPv4")->setConfiguration(ipv4));
        if (!dns.empty()) {
            EXPECT_TRUE(service->copyProtocol("DNS")->setConfiguration(dns));
        }
        EXPECT_TRUE(connection->commitChanges()) << store().errorText(store().lastErrorCode());
        const bool isApplied = connection->applyChanges();
        EXPECT_EQ(isApplied, store().lastErrorCode() == 0);
        return store().lastErrorCode();
    }

    static Dictionary manual(const std::string& address, const std::string& mask, const std::string& router) {
        return {{"ConfigMethod", "Manual"},
                {"Addresses", Array{address}},
                {"SubnetMasks", Array{mask}},
                {"Router", router}};
    }

    static std::string addresses(const std::string& device) {
        return shell("ip -4 -o addr show dev " + device + " | awk '{print $4}' | xargs");
    }
    // Whether a route's link is down the kernel tells some time after the link itself tells it.
    static std::string defaultRoutes() {
        return shell("ip -4 route show default | sed 's/ linkdown//; s/ *$//'");
    }
    // Without what each backend chooses by itself.
    static std::string plainDefaultRoutes() {
        return shell("ip -4 route show default | sed 's/ metric.*//; s/ linkdown//; s/ *$//'");
    }

    // A pair whose other end is up too, and which the backend has noticed.
    void addPair(const std::string& device) {
        shell("ip link add " + device + " type veth peer name p-" + device + " && ip link set " + device +
              " up && ip link set p-" + device + " up");
        backend->waitForDevice(device);
    }
    std::string idOf(const std::string& device) {
        return *serviceOf(*store().open("a test"), device)->serviceID();
    }
    platform::NetworkConfigStore& store() { return backend->configStore(); }

    TemporaryRoot root;
    std::unique_ptr<NetworkBackend> backend;
};

// On every backend.
class NetworkStoresContractTest : public NetworkStoresFixture,
                                  public testing::WithParamInterface<NamedNetworkBackend> {
  protected:
    void SetUp() override { start(GetParam().make); }
};

INSTANTIATE_TEST_SUITE_P(Every, NetworkStoresContractTest, testing::ValuesIn(networkBackends()),
                         [](const auto& each) { return each.param.name; });

// On the kernel alone: what is in the file, and what the kernel has that nobody configured.
class NetworkStoresTest : public NetworkStoresFixture {
  protected:
    void SetUp() override { start(networkBackends().front().make); }
};

// State

TEST_P(NetworkStoresContractTest, AMachineWithoutLinksHasNoState) {
    EXPECT_EQ(globalIPv4(), std::nullopt);
    EXPECT_EQ(serviceIPv4("eth7"), std::nullopt);
    EXPECT_EQ(link("eth7"), std::nullopt);
    EXPECT_EQ(link(""), std::nullopt);
    EXPECT_EQ(link(std::string(300, 'x')), std::nullopt);
    EXPECT_TRUE(interfaces().empty());
}

TEST_P(NetworkStoresContractTest, ALinkIsActiveWhileItIsUpAndItsPeerIsToo) {
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

TEST_F(NetworkStoresTest, TheAddressesOfAServiceAreThoseOfItsDeviceInTheKernelsOrder) {
    addPair("eth7");
    EXPECT_EQ(serviceIPv4("eth7"), std::nullopt);
    shell("ip addr add 192.0.2.7/24 dev eth7 && ip addr add 192.0.2.8/24 dev eth7 && "
          "ip addr add 10.1.2.3/9 dev eth7 && ip addr add 198.51.100.1/24 dev p-eth7");
    EXPECT_EQ(serviceIPv4("eth7"),
              (Dictionary{{"Addresses", Array{"192.0.2.7", "10.1.2.3", "192.0.2.8"}},
                          {"SubnetMasks", Array{"255.255.255.0", "255.128.0.0", "255.255.255.0"}}}));
}

TEST_F(NetworkStoresTest, TheAddressOfAPointToPointLinkIsItsOwn) {
    addPair("eth7");
    shell("ip addr add 192.0.2.7 peer 198.51.100.1/32 dev eth7");
    EXPECT_EQ(serviceIPv4("eth7")->at("Addresses"), PropertyList(Array{"192.0.2.7"}));
}

TEST_F(NetworkStoresTest, ThePrimaryServiceOwnsTheDefaultRouteWithTheLowestMetric) {
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

TEST_F(NetworkStoresTest, OnlyDefaultRoutesOfTheMainTableCount) {
    addPair("eth7");
    shell("ip addr add 192.0.2.7/24 dev eth7 && ip route add default via 192.0.2.1 table 99 && "
          "ip route add 203.0.113.0/24 via 192.0.2.1 && ip route add unreachable default metric 4000 && "
          "ip -6 route add default dev eth7");
    EXPECT_EQ(globalIPv4(), std::nullopt);
    shell("ip route add default nexthop via 192.0.2.2 dev eth7 nexthop via 192.0.2.3 dev eth7");
    EXPECT_EQ(globalIPv4(), (Dictionary{{"PrimaryService", "eth7"}, {"Router", "192.0.2.2"}}));
}

TEST_F(NetworkStoresTest, ServersAndDomainComeFromTheResolversFile) {
    const Key key = Key::global(NetworkDomain::State, NetworkEntity::DNS);
    EXPECT_EQ(value(key),
              (Dictionary{{"ServerAddresses", Array{"192.0.2.53"}}, {"DomainName", "home.example"}}));
    root.addFile("/etc/resolv.conf", "# nothing\n");
    EXPECT_EQ(value(key), std::nullopt);
    root.addFile("/etc/resolv.conf", std::string(1024 * 1024 + 1, '\n'));
    EXPECT_EQ(value(key), std::nullopt);
}

TEST_P(NetworkStoresContractTest, OtherKeysHaveNoValue) {
    addPair("eth7");
    EXPECT_EQ(value(Key::global(NetworkDomain::Setup, NetworkEntity::IPv4)), std::nullopt);
    EXPECT_EQ(value(Key::global(NetworkDomain::State, NetworkEntity::Link)), std::nullopt);
    EXPECT_EQ(value(Key::interface(NetworkDomain::Setup, "eth7", NetworkEntity::Link)), std::nullopt);
    EXPECT_EQ(value(Key::interface(NetworkDomain::State, "eth7", NetworkEntity::IPv4)), std::nullopt);
    EXPECT_EQ(value(Key::service(NetworkDomain::State, "eth7", NetworkEntity::DNS)), std::nullopt);
    EXPECT_EQ(value(Key::service(NetworkDomain::Setup, "eth7", NetworkEntity::Link)), std::nullopt);
}

TEST_F(NetworkStoresTest, TheSetupDomainIsWhatIsStored) {
    addPair("eth7");
    const Key key = Key::service(NetworkDomain::Setup, "eth7", NetworkEntity::IPv4);
    EXPECT_EQ(value(key), std::nullopt);
    EXPECT_EQ(configure("eth7", manual("192.0.2.7", "255.255.255.0", "192.0.2.1")), 0);
    EXPECT_EQ(value(key), manual("192.0.2.7", "255.255.255.0", "192.0.2.1"));
}

// Interfaces

TEST_P(NetworkStoresContractTest, EveryLinkButTheLoopbackIsAnInterfaceWithItsKind) {
    shell("ip link add eth7 type veth peer name eth8 && ip link add br0 type bridge && "
          "ip link set eth7 master br0 && ip link add mac0 link eth8 type macvlan && ip link add br1 type "
          "bridge");
    EXPECT_EQ(interfaces(),
              (std::vector<std::string>{"Ethernet eth8", "Ethernet eth7", "Bridge br0 > Ethernet eth7",
                                        "MACVLAN mac0 > Ethernet eth8", "Bridge br1"}));
    EXPECT_EQ(store().copyInterfaces().front()->displayName(), "Ethernet (eth8)");
}

TEST_F(NetworkStoresTest, WhatSysShowsOfAnotherNetworkIsNotOfThisOne) {
    addPair("wlan7");
    root.addDirectory("/sys/class/net/wlan7/phy80211");
    root.addDirectory("/sys/class/ieee80211/phy0");
    EXPECT_EQ(interfaces(), (std::vector<std::string>{"Ethernet p-wlan7", "Ethernet wlan7"}));
}

TEST_F(NetworkStoresTest, AThousandLinksAreAllListed) {
    shell("for i in $(seq 500); do echo link add v$i type veth peer name w$i; done | ip -batch -");
    EXPECT_EQ(store().copyInterfaces().size(), 1000U);
    EXPECT_EQ(store().open("a test")->copyCurrentSet()->copyServices()->size(), 1000U);
}

// Configuration

TEST_F(NetworkStoresTest, HardwareHasAServiceThatIsStoredWhenItIsEstablished) {
    addPair("eth7");
    const auto connection = store().open("a test");
    const auto set = connection->copyCurrentSet();
    ASSERT_NE(set, nullptr);
    EXPECT_EQ(set->copyServices()->size(), 2U);
    EXPECT_EQ(root.content(kFile), std::nullopt);
    EXPECT_TRUE(set->establishDefaultConfiguration());
    EXPECT_TRUE(connection->commitChanges());
    EXPECT_NE(root.content(kFile), std::nullopt);
    EXPECT_FALSE(set->establishDefaultConfiguration());
    EXPECT_EQ(store().lastErrorCode(), 0);

    const auto other = store().open("a test");
    EXPECT_FALSE(other->copyCurrentSet()->establishDefaultConfiguration());
    const auto service = serviceOf(*other, "eth7");
    ASSERT_NE(service, nullptr);
    EXPECT_EQ(service->serviceID(), "eth7");
    EXPECT_EQ(service->name(), "Ethernet (eth7)");
    EXPECT_EQ(service->copyProtocol("IPv4")->configuration(), (Dictionary{{"ConfigMethod", "DHCP"}}));
    EXPECT_EQ(service->copyProtocols()->size(), 2U);
    EXPECT_EQ(service->copyProtocol("Other"), nullptr);
}

TEST_P(NetworkStoresContractTest, HardwareThatAppearsLaterIsEstablishedToo) {
    const auto connection = store().open("a test");
    const auto set = connection->copyCurrentSet();
    EXPECT_FALSE(set->establishDefaultConfiguration());
    addPair("eth7");
    EXPECT_TRUE(set->establishDefaultConfiguration());
}

TEST_F(NetworkStoresTest, HardwareWhoseServiceWasChangedNeedsNoEstablishing) {
    addPair("eth7");
    const auto connection = store().open("a test");
    for (const char* device : {"eth7", "p-eth7"}) {
        EXPECT_TRUE(serviceOf(*connection, device)->addProtocolType("One"));
    }
    EXPECT_FALSE(connection->copyCurrentSet()->establishDefaultConfiguration());
    EXPECT_TRUE(connection->commitChanges());
    EXPECT_NE(serviceOf(*store().open("a test"), "eth7")->copyProtocol("One"), nullptr);
}

TEST_F(NetworkStoresTest, HardwareThatTwoConnectionsEstablishGetsOneService) {
    addPair("eth7");
    const auto first = store().open("a test");
    const auto second = store().open("another");
    EXPECT_TRUE(first->copyCurrentSet()->establishDefaultConfiguration());
    EXPECT_TRUE(second->copyCurrentSet()->establishDefaultConfiguration());
    EXPECT_TRUE(first->commitChanges());
    EXPECT_TRUE(second->commitChanges());
    EXPECT_EQ(store().open("a test")->copyCurrentSet()->copyServices()->size(), 2U);
}

TEST_F(NetworkStoresTest, PortsOfABridgeAndStackedLinksGetNoServiceButTheBridgeDoes) {
    shell("ip link add eth7 type veth peer name eth8 && ip link add br0 type bridge && ip link add br1 type "
          "bridge && "
          "ip link set eth7 master br0 && ip link add mac0 link eth8 type macvlan");
    std::vector<std::string> found;
    const auto services = store().open("a test")->copyCurrentSet()->copyServices();
    for (const auto& each : *services) {
        found.push_back(shown(each->interface()));
    }
    EXPECT_EQ(found, (std::vector<std::string>{"Ethernet eth8", "Bridge br0 > Ethernet eth7"}));
}

TEST_F(NetworkStoresTest, AStoredDefaultConfiguresNothing) {
    addPair("eth7");
    const auto connection = store().open("a test");
    connection->copyCurrentSet()->establishDefaultConfiguration();
    EXPECT_TRUE(connection->commitChanges());
    EXPECT_TRUE(connection->applyChanges());
    EXPECT_EQ(store().lastErrorCode(), 0);
    EXPECT_FALSE(std::filesystem::exists(root.locate("/run/welcomer")));
}

TEST_F(NetworkStoresTest, ChangesAreSeenHereAtOnceAndByOthersOnceCommitted) {
    addPair("eth7");
    const auto connection = store().open("a test");
    const auto other = store().open("another");
    const auto service = serviceOf(*connection, "eth7");
    EXPECT_TRUE(service->copyProtocol("IPv4")->setConfiguration({{"ConfigMethod", "Manual"}}));
    EXPECT_TRUE(service->addProtocolType("IPv6"));
    EXPECT_TRUE(service->setEnabled(false));
    EXPECT_EQ(service->copyProtocol("IPv4")->configuration(), (Dictionary{{"ConfigMethod", "Manual"}}));
    EXPECT_EQ(service->copyProtocol("IPv6")->configuration(), std::nullopt);
    EXPECT_TRUE(connection->commitChanges());
    EXPECT_EQ(serviceOf(*other, "eth7")->copyProtocol("IPv6"), nullptr);
    other->synchronize();
    EXPECT_NE(serviceOf(*other, "eth7")->copyProtocol("IPv6"), nullptr);
    EXPECT_NE(root.content(kFile)->find("<false/>"), std::string::npos);
}

TEST_F(NetworkStoresTest, SynchronizingDropsChanges) {
    addPair("eth7");
    const auto connection = store().open("a test");
    serviceOf(*connection, "eth7")->copyProtocol("IPv4")->setConfiguration({{"ConfigMethod", "Manual"}});
    connection->synchronize();
    EXPECT_TRUE(connection->commitChanges());
    EXPECT_TRUE(connection->applyChanges());
    EXPECT_EQ(root.content(kFile), std::nullopt);
}

TEST_F(NetworkStoresTest, TwoConnectionsLoseNoneOfTheirChanges) {
    addPair("eth7");
    const auto first = store().open("a test");
    const auto second = store().open("another");
    serviceOf(*first, "eth7")->addProtocolType("One");
    serviceOf(*second, "eth7")->addProtocolType("Two");
    serviceOf(*second, "p-eth7")->addProtocolType("Three");
    EXPECT_TRUE(first->commitChanges());
    EXPECT_TRUE(second->commitChanges());
    const auto read = store().open("a test");
    EXPECT_NE(serviceOf(*read, "eth7")->copyProtocol("One"), nullptr);
    EXPECT_NE(serviceOf(*read, "eth7")->copyProtocol("Two"), nullptr);
    EXPECT_NE(serviceOf(*read, "p-eth7")->copyProtocol("Three"), nullptr);
}

TEST_P(NetworkStoresContractTest, AProtocolThatIsThereIsNotAddedAgain) {
    addPair("eth7");
    const auto connection = store().open("a test");
    EXPECT_FALSE(serviceOf(*connection, "eth7")->addProtocolType("IPv4"));
    EXPECT_EQ(store().lastErrorCode(), platform::kNetworkConfigAlreadyThere);
    EXPECT_EQ(serviceOf(*connection, "eth7")->copyProtocol("IPv4")->configuration(),
              (Dictionary{{"ConfigMethod", "DHCP"}}));
}

TEST_F(NetworkStoresTest, ADamagedFileCountsAsEmptyAndIsSetAside) {
    addPair("eth7");
    root.addFile(kFile, "<plist><dict>");
    EXPECT_EQ(configure("eth7", manual("192.0.2.7", "255.255.255.0", "")), 0);
    EXPECT_EQ(root.content(kFile + ".damaged"), "<plist><dict>");
}

TEST_F(NetworkStoresTest, AFileWithoutTheSetItNamesHasNoCurrentSet) {
    addPair("eth7");
    root.addFile(kFile, "{ CurrentSet = office; Sets = { home = { Services = (); }; }; }");
    EXPECT_EQ(store().open("a test")->copyCurrentSet(), nullptr);
    root.addFile(kFile, "{ CurrentSet = home; Sets = { home = { Services = (w, gone, (x)); }; }; "
                        "Services = { w = { Device = eth9; Name = Mine; }; }; }");
    const auto connection = store().open("a test");
    const auto services = connection->copyCurrentSet()->copyServices();
    ASSERT_EQ(services->size(), 3U); // and the hardware's
    EXPECT_EQ(services->front()->name(), "Mine");
    EXPECT_EQ(shown(services->front()->interface()), "none eth9");
    EXPECT_TRUE(services->front()->copyProtocols()->empty());
}

TEST_F(NetworkStoresTest, FilesThatMakeNoSenseAreReadAsEmpty) {
    addPair("eth7");
    for (const char* text :
         {"()", "{ Sets = (); Services = text; }", "{ Sets = { automatic = ( ); }; }",
          "{ Sets = { automatic = { Services = { }; }; }; Services = { eth7 = text; }; }"}) {
        root.addFile(kFile, text);
        const auto connection = store().open("a test");
        ASSERT_NE(connection->copyCurrentSet(), nullptr) << text;
        EXPECT_TRUE(connection->copyCurrentSet()->establishDefaultConfiguration()) << text;
        EXPECT_TRUE(connection->commitChanges()) << text;
        EXPECT_NE(serviceOf(*store().open("a test"), "eth7"), nullptr) << text;
    }
}

TEST_F(NetworkStoresTest, AFolderThatCannotBeMadeIsAWriteError) {
    addPair("eth7");
    root.addFile("/var/lib", "a file");
    const auto connection = store().open("a test");
    connection->copyCurrentSet()->establishDefaultConfiguration();
    EXPECT_FALSE(connection->commitChanges());
    EXPECT_EQ(store().lastErrorCode(), platform::kNetworkConfigWriteFailed);
}

TEST_F(NetworkStoresTest, AFileThatIsNoneIsAReadError) {
    addPair("eth7");
    root.addDirectory(kFile);
    const auto connection = store().open("a test");
    connection->copyCurrentSet()->establishDefaultConfiguration();
    EXPECT_FALSE(connection->commitChanges());
    EXPECT_EQ(store().lastErrorCode(), platform::kNetworkConfigReadFailed);
}

TEST_F(NetworkStoresTest, AnOrdinaryUserReadsEverythingAndIsRefusedToChangeAnything) {
    addPair("eth7");
    ASSERT_EQ(configure("eth7", manual("192.0.2.7", "255.255.255.0", "192.0.2.1")), 0);
    const std::string before = *root.content(kFile);
    ASSERT_EQ(::chmod(root.path().c_str(), 0755), 0);
    const pid_t child = ::fork();
    if (child == 0) {
        constexpr uid_t kNobody = 65534;
        if (::setgid(kNobody) != 0 || ::setuid(kNobody) != 0) {
            ::_exit(1);
        }
        if (serviceIPv4("eth7")->at("Addresses") != PropertyList(Array{"192.0.2.7"}) ||
            link("eth7") != active(true) || interfaces().size() != 2 ||
            globalIPv4()->at("Router") != PropertyList("192.0.2.1")) {
            ::_exit(2);
        }
        const auto connection = store().open("a test");
        const auto protocol = serviceOf(*connection, "eth7")->copyProtocol("IPv4");
        if (protocol->configuration()->at("ConfigMethod") != PropertyList("Manual") ||
            !protocol->setConfiguration(manual("192.0.2.8", "255.255.255.0", ""))) {
            ::_exit(3);
        }
        if (connection->commitChanges() || store().lastErrorCode() != platform::kNetworkConfigAccessDenied) {
            ::_exit(4);
        }
        ::_exit(0);
    }
    int status = -1;
    ASSERT_EQ(::waitpid(child, &status, 0), child);
    EXPECT_EQ(status, 0);
    EXPECT_EQ(root.content(kFile), before);
    EXPECT_EQ(addresses("eth7"), "192.0.2.7/24\n");
}

// Applying

TEST_F(NetworkStoresTest, AManualConfigurationSetsAddressMaskAndRouterAndBringsTheLinkUp) {
    shell("ip link add eth7 type veth peer name peer7");
    EXPECT_EQ(configure("eth7", manual("192.0.2.7", "255.255.254.0", "192.0.2.1")), 0);
    EXPECT_EQ(addresses("eth7"), "192.0.2.7/23\n");
    shell("ip link set peer7 up");
    EXPECT_EQ(defaultRoutes(), "default via 192.0.2.1 dev eth7 proto static\n");
    EXPECT_EQ(link("eth7"), active(true));
}

TEST_P(NetworkStoresContractTest, AManualConfigurationReplacesWhatWasThere) {
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

TEST_P(NetworkStoresContractTest, ApplyingTheSameAgainChangesNothing) {
    addPair("eth7");
    for (int round = 0; round < 3; ++round) {
        EXPECT_EQ(configure("eth7", manual("192.0.2.7", "255.255.255.0", "192.0.2.1")), 0);
        EXPECT_EQ(addresses("eth7"), "192.0.2.7/24\n");
        EXPECT_EQ(plainDefaultRoutes(), "default via 192.0.2.1 dev eth7 proto static\n");
    }
}

TEST_F(NetworkStoresTest, WithoutARouterThereIsNoDefaultRouteOfThatDevice) {
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

TEST_F(NetworkStoresTest, TheManualDHCPMethodSetsTheAddressWithTheMaskThatIsThere) {
    addPair("eth7");
    Dictionary inform = manual("192.0.2.7", "255.255.255.0", "192.0.2.1");
    inform["ConfigMethod"] = "INFORM";
    EXPECT_EQ(configure("eth7", inform), 0);
    EXPECT_EQ(addresses("eth7"), "192.0.2.7/24\n");
    inform.erase("SubnetMasks");
    EXPECT_EQ(configure("eth7", inform), platform::kNetworkConfigInvalid);
}

TEST_P(NetworkStoresContractTest, WhatMakesNoSenseIsRefusedAndChangesNothing) {
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
        {{"ConfigMethod", "Manual"}},
        {{"ConfigMethod", "Manual"},
         {"Addresses", Array{"192.0.2.7"}},
         {"SubnetMasks", Array{good}},
         {"Router", 7}},
        {{"ConfigMethod", "Manual"}, {"Addresses", "192.0.2.7"}, {"SubnetMasks", good}},
        {{"ConfigMethod", "Manual"}, {"Addresses", Array()}, {"SubnetMasks", Array{good}}},
        {{"ConfigMethod", "Manual"}, {"Addresses", Array{7}}, {"SubnetMasks", Array{good}}},
    };
    for (const Dictionary& bad : kBad) {
        EXPECT_EQ(configure("eth7", bad), platform::kNetworkConfigInvalid);
    }
    EXPECT_EQ(configure("eth7", {{"ConfigMethod", "Telepathy"}}), platform::kNetworkConfigUnknownMethod);
    EXPECT_EQ(configure("eth7", {{"ConfigMethod", 4}}), platform::kNetworkConfigUnknownMethod);
    EXPECT_EQ(addresses("eth7"), "10.0.0.9/8\n");
}

TEST_F(NetworkStoresTest, OfSeveralServicesThatCannotBeAppliedTheFirstOnesErrorCounts) {
    addPair("eth7");
    const auto connection = store().open("a test");
    serviceOf(*connection, "eth7")->copyProtocol("IPv4")->setConfiguration(manual("none", "", ""));
    serviceOf(*connection, "p-eth7")->copyProtocol("IPv4")->setConfiguration({{"ConfigMethod", "Telepathy"}});
    EXPECT_TRUE(connection->commitChanges());
    EXPECT_FALSE(connection->applyChanges());
    EXPECT_EQ(store().lastErrorCode(), platform::kNetworkConfigInvalid);
}

TEST_F(NetworkStoresTest, ARouterThatTheKernelRefusesIsAnErrorAndTheAddressesStay) {
    addPair("eth7");
    shell("ip addr add 10.0.0.9/8 dev eth7 && ip route add default via 10.0.0.1");
    EXPECT_EQ(configure("eth7", manual("192.0.2.7", "255.255.255.0", "198.51.100.1")),
              platform::kNetworkConfigKernelRefused + ENETUNREACH);
    EXPECT_EQ(store().errorText(store().lastErrorCode()),
              "the kernel refused: Network is unreachable (eth7)");
    EXPECT_EQ(addresses("eth7"), "10.0.0.9/8\n");
    EXPECT_EQ(defaultRoutes(), "default via 10.0.0.1 dev eth7\n");
}

TEST_P(NetworkStoresContractTest, ADeviceThatIsGoneIsAnError) {
    addPair("eth7");
    const auto connection = store().open("a test");
    serviceOf(*connection, "eth7")
        ->copyProtocol("IPv4")
        ->setConfiguration(manual("192.0.2.7", "255.255.255.0", ""));
    shell("ip link del eth7");
    EXPECT_TRUE(connection->commitChanges());
    EXPECT_FALSE(connection->applyChanges());
    EXPECT_EQ(store().lastErrorCode(), platform::kNetworkConfigNoDevice);
    addPair("eth7");
    EXPECT_TRUE(connection->applyChanges()); // what failed can be tried again
    EXPECT_EQ(addresses("eth7"), "192.0.2.7/24\n");
}

TEST_F(NetworkStoresTest, NameServersGoToTheResolversFileWhichKeepsItsOtherLines) {
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

TEST_F(NetworkStoresTest, NameServersThatAreNoneAreRefusedBeforeAnythingIsChanged) {
    addPair("eth7");
    const std::string before = *root.content("/etc/resolv.conf");
    for (const char* bad :
         {"no address", "", "192.0.2.1\noptions debug", "1.2.3", "::1%", "::1%a b", "\t192.0.2.1"}) {
        EXPECT_EQ(configure("eth7", manual("192.0.2.7", "255.255.255.0", ""),
                            {{"ServerAddresses", Array{"192.0.2.1", bad}}}),
                  platform::kNetworkConfigInvalid)
            << bad;
    }
    EXPECT_EQ(root.content("/etc/resolv.conf"), before);
    EXPECT_EQ(addresses("eth7"), "\n");
}

TEST_F(NetworkStoresTest, AResolversFileThatIsALinkIsAnothersAndLeftAlone) {
    addPair("eth7");
    root.addFile("/run/other/resolv.conf", "nameserver 192.0.2.99\n");
    std::filesystem::remove(root.locate("/etc/resolv.conf"));
    std::filesystem::create_symlink("../run/other/resolv.conf", root.locate("/etc/resolv.conf"));
    EXPECT_EQ(configure("eth7", manual("192.0.2.7", "255.255.255.0", ""),
                        {{"ServerAddresses", Array{"192.0.2.1"}}}),
              platform::kNetworkConfigNameServersElsewhere);
    EXPECT_EQ(root.content("/run/other/resolv.conf"), "nameserver 192.0.2.99\n");
}

TEST_F(NetworkStoresTest, AMissingResolversFileIsMadeAndOneThatCannotBeWrittenIsAnError) {
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

TEST_F(NetworkStoresTest, TenThousandNameServersAreWritten) {
    addPair("eth7");
    EXPECT_EQ(configure("eth7", manual("192.0.2.7", "255.255.255.0", ""),
                        {{"ServerAddresses", Array(10000, "192.0.2.1")}}),
              0);
    const std::string text = *root.content("/etc/resolv.conf");
    EXPECT_EQ(std::ranges::count(text, '\n'), 10002);
}

TEST_F(NetworkStoresTest, TheLinkLocalMethodAndNoMethodConfigureNothing) {
    addPair("eth7");
    shell("ip addr add 10.0.0.9/8 dev eth7");
    EXPECT_EQ(configure("eth7", {{"ConfigMethod", "LinkLocal"}}), 0);
    EXPECT_EQ(configure("eth7", Dictionary()), 0);
    EXPECT_EQ(addresses("eth7"), "10.0.0.9/8\n");
}

TEST_P(NetworkStoresContractTest, TheServiceThatTheTrafficTakesIsPrimary) {
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

TEST_P(NetworkStoresContractTest, WithoutServersOfItsOwnTheResolversFileCounts) {
    addPair("eth7");
    EXPECT_EQ(configure("eth7", manual("192.0.2.7", "255.255.255.0", "192.0.2.1")), 0);
    EXPECT_EQ(value(Key::global(NetworkDomain::State, NetworkEntity::DNS)),
              (Dictionary{{"ServerAddresses", Array{"192.0.2.53"}}, {"DomainName", "home.example"}}));
}

TEST_P(NetworkStoresContractTest, HardwareHasAServiceWhichEstablishingStores) {
    addPair("eth7");
    const auto connection = store().open("a test");
    const auto set = connection->copyCurrentSet();
    const std::string id = *serviceOf(*connection, "eth7")->serviceID();
    EXPECT_TRUE(set->establishDefaultConfiguration());
    EXPECT_TRUE(connection->commitChanges());
    EXPECT_FALSE(set->establishDefaultConfiguration());
    EXPECT_EQ(store().lastErrorCode(), 0);
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

TEST_P(NetworkStoresContractTest, ChangesAreSeenHereAtOnceAndByOthersOnceTheySynchronize) {
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

TEST_P(NetworkStoresContractTest, SynchronizingDropsWhatIsNotCommitted) {
    addPair("eth7");
    const auto connection = store().open("a test");
    serviceOf(*connection, "eth7")->copyProtocol("IPv4")->setConfiguration({{"ConfigMethod", "Manual"}});
    connection->synchronize();
    EXPECT_TRUE(connection->commitChanges());
    EXPECT_TRUE(connection->applyChanges());
    EXPECT_EQ(serviceOf(*store().open("a test"), "eth7")->copyProtocol("IPv4")->configuration(),
              (Dictionary{{"ConfigMethod", "DHCP"}}));
}

TEST_P(NetworkStoresContractTest, ConnectionsLoseNoneOfTheirChanges) {
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

TEST_P(NetworkStoresContractTest, AManualConfigurationWithoutARouterHasNoDefaultRoute) {
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

TEST_P(NetworkStoresContractTest, TheManualDHCPMethodSetsTheAddressThoughNoServerAnswers) {
    addPair("eth7");
    Dictionary inform = manual("192.0.2.7", "255.255.255.0", "192.0.2.1");
    inform["ConfigMethod"] = "INFORM";
    EXPECT_EQ(configure("eth7", inform), 0);
    EXPECT_EQ(addresses("eth7"), "192.0.2.7/24\n");
    inform["Addresses"] = Array{"no address"};
    EXPECT_EQ(configure("eth7", inform), platform::kNetworkConfigInvalid);
}

TEST_P(NetworkStoresContractTest, ConfigurationsReadBackAsTheyWereWritten) {
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

TEST_P(NetworkStoresContractTest, NameServersThatAreNoneAreRefusedBeforeTheDeviceChanges) {
    addPair("eth7");
    for (const char* bad : {"no address", "", "192.0.2.1\noptions debug", "1.2.3", "\t192.0.2.1"}) {
        EXPECT_EQ(configure("eth7", manual("192.0.2.7", "255.255.255.0", ""),
                            {{"ServerAddresses", Array{"192.0.2.1", bad}}}),
                  platform::kNetworkConfigInvalid)
            << bad;
    }
    EXPECT_EQ(addresses("eth7"), "\n");
}

} // namespace
} // namespace welcomer
