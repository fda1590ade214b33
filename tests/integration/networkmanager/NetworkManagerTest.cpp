// The network stores and the reachability probe on a real NetworkManager.

#include "backends/desktop/DesktopNetwork.h"
#include "backends/local/network/LocalHostReachability.h"
#include "backends/local/network/LocalNetworkConfigStore.h"
#include "backends/local/network/LocalNetworkStateStore.h"
#include "tests/contract/TemporaryRoot.h"
#include "tests/support/MountNamespace.h"
#include "tests/support/NetworkManagerDaemon.h"
#include "tests/support/NetworkNamespace.h"

#include <gtest/gtest.h>

#include <sys/wait.h>
#include <thread>
#include <unistd.h>
#include <vector>

namespace welcomer {
namespace {

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
    desktop::DesktopNetwork network{{kernelStore, kernelStateStore, kernelReachability}, {nullptr, kNetworkModules}};
    platform::NetworkConfigStore& store = network.configStore();
    platform::NetworkStateStore& stateStore = network.stateStore();
    platform::HostReachability& reachability = network.hostReachability();
    std::optional<NeighbourNetwork> neighbour;
    std::optional<NetworkManagerDaemon> daemon;
    std::string errorText; // of the last configuration
};

// Profiles

TEST_F(NetworkManagerTest, EstablishingMakesProfilesForNewDevicesWhichAreUsedAtOnce) {
    addCable("eth7");
    serveAddresses("eth7");
    const auto connection = store.open("a test");
    const auto set = connection->copyCurrentSet();
    EXPECT_EQ(profiles(), "");
    EXPECT_TRUE(set->establishDefaultConfiguration());
    EXPECT_TRUE(connection->commitChanges());
    EXPECT_FALSE(set->establishDefaultConfiguration());
    EXPECT_EQ(connection->lastErrorCode(), 0);
    EXPECT_FALSE(store.open("a test")->copyCurrentSet()->establishDefaultConfiguration());
    const auto service = serviceOf(*connection, "eth7");
    EXPECT_EQ(service->name(), "Ethernet (eth7)");
    const std::string id = *service->serviceID();
    EXPECT_EQ(profile(id, "connection.interface-name"), "eth7");
    EXPECT_EQ(profile(id, "connection.autoconnect"), "yes");
    EXPECT_EQ(profile(id, "ipv4.method"), "auto");
    EXPECT_NE(shell("ls /run/profiles"), "");
    waitFor("ip -4 addr show dev eth7 | grep -q 192.0.2.5");
}

TEST_F(NetworkManagerTest, ADeviceThatAProfileFitsOrThatIsNotManagedGetsNoneOfItsOwn) {
    addCable("eth7");
    shell("ip link add p-eth8 type veth peer name p-eth9 && ip link add eth6 type veth peer name p-eth6");
    waitFor("nmcli device show eth6");
    shell("nmcli connection add type ethernet con-name Any ifname '*' autoconnect no");
    const auto connection = store.open("a test");
    EXPECT_FALSE(connection->copyCurrentSet()->establishDefaultConfiguration());
    EXPECT_EQ(connection->lastErrorCode(), 0);
    EXPECT_EQ(connection->copyCurrentSet()->copyServices()->size(), 1U);
}

TEST_F(NetworkManagerTest, TheProfileThatADeviceRunsComesFirst) {
    addCable("eth7");
    for (const char* name : {"Aaa", "Mmm", "Zzz"}) {
        shell(std::string("nmcli connection add type ethernet con-name ") + name +
              " ifname eth7 autoconnect no ipv4.method manual ipv4.addresses 192.0.2.9/24");
    }
    shell("nmcli connection up Mmm");
    EXPECT_EQ(serviceOf(*store.open("a test"), "eth7")->name(), "Mmm");
    shell("nmcli connection down Mmm && nmcli connection modify Zzz connection.autoconnect-priority 5");
    EXPECT_EQ(serviceOf(*store.open("a test"), "eth7")->name(), "Zzz");
}

TEST_F(NetworkManagerTest, WhatWasMerelyFoundOnADeviceIsNoService) {
    addCable("eth7");
    shell("ip addr add 192.0.2.44/24 dev eth7 && ip link set eth7 up");
    waitFor("nmcli -t connection show | grep -q eth7");
    const auto service = serviceOf(*store.open("a test"), "eth7");
    EXPECT_EQ(service->name(), "Ethernet (eth7)");
    EXPECT_EQ(service->copyProtocol("IPv4")->configuration(), (Dictionary{{"ConfigMethod", "DHCP"}}));
}

TEST_F(NetworkManagerTest, OnlyTheKeysOfTheMethodReachTheProfileAndTheWholeDictionaryReadsBack) {
    addCable("eth7");
    EXPECT_EQ(configure("eth7", manual("192.0.2.7", "192.0.2.1")), 0);
    const std::string id = idOf("eth7");
    EXPECT_EQ(profile(id, "ipv4.method,ipv4.addresses,ipv4.gateway"), "manual\n192.0.2.7/24\n192.0.2.1");
    serveAddresses("eth7");
    Dictionary mixed = manual("192.0.2.7", "192.0.2.1");
    mixed["ConfigMethod"] = "DHCP";
    mixed["DHCPClientID"] = "a client";
    mixed["Unknown"] = 7;
    EXPECT_EQ(configure("eth7", mixed), 0);
    EXPECT_EQ(profile(id, "ipv4.method,ipv4.addresses,ipv4.gateway,ipv4.dhcp-client-id"),
              "auto\n\n\na client");
    EXPECT_EQ(ipv4("eth7"), mixed);
    mixed["ConfigMethod"] = "BOOTP";
    EXPECT_EQ(configure("eth7", mixed), 0);
    EXPECT_EQ(profile(id, "ipv4.method,ipv4.addresses,ipv4.gateway,ipv4.dhcp-client-id"), "auto");
    EXPECT_EQ(ipv4("eth7"), mixed);
    mixed["ConfigMethod"] = "Manual";
    EXPECT_EQ(configure("eth7", mixed), 0);
    EXPECT_EQ(profile(id, "ipv4.method,ipv4.addresses,ipv4.gateway,ipv4.dhcp-client-id"),
              "manual\n192.0.2.7/24\n192.0.2.1");
    EXPECT_EQ(addresses("eth7"), "192.0.2.7/24");
}

TEST_F(NetworkManagerTest, ALongDictionaryIsKeptInPiecesThatSurviveEditsByOthers) {
    addCable("eth7");
    Dictionary much = manual("192.0.2.7");
    std::string text;
    for (int number = 0; text.size() < 40'000; ++number) {
        text += " \t\nä€😀\\;=[x]" + std::to_string(number);
    }
    much["Much"] = text;
    much["List"] = Array{1, 2.5, true, PropertyList::Data{std::string(5000, '\0')}};
    EXPECT_EQ(configure("eth7", much), 0);
    EXPECT_EQ(ipv4("eth7"), much);
    const std::string id = idOf("eth7");
    shell("nmcli connection modify " + id + " connection.id Renamed connection.autoconnect no");
    shell("nmcli connection reload");
    EXPECT_EQ(ipv4("eth7"), much);
    EXPECT_EQ(serviceOf(*store.open("a test"), "eth7")->name(), "Renamed");
    EXPECT_EQ(configure("eth7", manual("192.0.2.7")), 0); // and nothing of the pieces stays
    EXPECT_EQ(ipv4("eth7"), manual("192.0.2.7"));
    EXPECT_EQ(shell("grep -c com.corvid.welcomer.protocols /run/profiles/*"), "1\n");
}

TEST_F(NetworkManagerTest, WhatIsTooMuchForAProfileIsAWriteErrorAndNoneOfTheServicesChanges) {
    addCable("eth7");
    addCable("eth8");
    const auto connection = store.open("a test");
    serviceOf(*connection, "eth7")->copyProtocol("IPv4")->setConfiguration(manual("192.0.2.7"));
    serviceOf(*connection, "eth8")
        ->copyProtocol("IPv4")
        ->setConfiguration({{"Much", std::string(3'000'000, 'x')}});
    EXPECT_FALSE(connection->commitChanges());
    EXPECT_EQ(connection->lastErrorCode(), platform::kNetworkConfigWriteFailed);
    EXPECT_EQ(profiles(), "");
}

TEST_F(NetworkManagerTest, WhereOneProfileCannotBeWrittenThoseBeforeItArePutBack) {
    addCable("eth7");
    addCable("eth8");
    for (const char* device : {"eth7", "eth8"}) {
        shell(std::string("nmcli connection add type ethernet autoconnect no con-name ") + device +
              " ifname " + device + " ipv4.method manual ipv4.addresses 192.0.2.9/24");
    }
    const auto connection = store.open("a test");
    serviceOf(*connection, "eth7")->copyProtocol("IPv4")->setConfiguration(manual("192.0.2.7"));
    serviceOf(*connection, "eth8")->copyProtocol("IPv4")->setConfiguration(manual("192.0.2.8"));
    // A folder in a file's place cannot be replaced.
    shell("cd /run/profiles && rm eth8.nmconnection && mkdir -p eth8.nmconnection/full");
    EXPECT_FALSE(connection->commitChanges());
    EXPECT_EQ(connection->lastErrorCode(), platform::kNetworkConfigWriteFailed);
    EXPECT_EQ(profile("eth7", "ipv4.addresses"), "192.0.2.9/24");
    shell("rm -r /run/profiles/eth8.nmconnection");
    EXPECT_TRUE(connection->commitChanges()); // what was refused can be tried again
    EXPECT_EQ(profile("eth7", "ipv4.addresses"), "192.0.2.7/24");
    EXPECT_EQ(profile("eth8", "ipv4.addresses"), "192.0.2.8/24");
}

TEST_F(NetworkManagerTest, WhatOthersChangeInTheProfileIsRead) {
    addCable("eth7");
    EXPECT_EQ(configure("eth7", manual("192.0.2.7", "192.0.2.1"), {{"ServerAddresses", Array{"192.0.2.53"}}}),
              0);
    const std::string id = idOf("eth7");
    shell("nmcli connection modify " + id +
          " ipv4.addresses 192.0.2.8/25 ipv4.gateway '' ipv4.dns 192.0.2.54");
    EXPECT_EQ(ipv4("eth7"), (Dictionary{{"ConfigMethod", "Manual"},
                                        {"Addresses", Array{"192.0.2.8"}},
                                        {"SubnetMasks", Array{"255.255.255.128"}}}));
    EXPECT_EQ(serviceOf(*store.open("a test"), "eth7")->copyProtocol("DNS")->configuration(),
              (Dictionary{{"ServerAddresses", Array{"192.0.2.54"}}}));
    shell("nmcli connection modify " + id + " ipv4.method auto");
    EXPECT_EQ(ipv4("eth7").at("ConfigMethod"), PropertyList("INFORM"));
    shell("nmcli connection modify " + id + " ipv4.addresses '' ipv4.dhcp-client-id me");
    EXPECT_EQ(ipv4("eth7"), (Dictionary{{"ConfigMethod", "DHCP"}, {"DHCPClientID", "me"}}));
    shell("nmcli connection modify " + id + " ipv4.method disabled ipv4.dns ''");
    EXPECT_EQ(ipv4("eth7"), Dictionary());
}

TEST_F(NetworkManagerTest, EnablingIsConnectingAutomatically) {
    addCable("eth7");
    for (const bool isEnabled : {false, true}) {
        const auto connection = store.open("a test");
        EXPECT_TRUE(serviceOf(*connection, "eth7")->setEnabled(isEnabled));
        EXPECT_TRUE(connection->commitChanges());
        EXPECT_EQ(profile(idOf("eth7"), "connection.autoconnect"), isEnabled ? "yes" : "no");
    }
}

TEST_F(NetworkManagerTest, ServersReachTheProfileByFamilyAndTakeThePlaceOfTheNetworksOwn) {
    addCable("eth7");
    EXPECT_EQ(configure("eth7", manual("192.0.2.7"),
                        {{"ServerAddresses", Array{"192.0.2.53  ", "2001:db8::53", "192.0.2.54"}}}),
              0);
    const std::string id = idOf("eth7");
    EXPECT_EQ(profile(id, "ipv4.dns,ipv6.dns,ipv4.ignore-auto-dns"),
              "192.0.2.53,192.0.2.54\n2001\\:db8\\:\\:53\nyes");
    EXPECT_EQ(serviceOf(*store.open("a test"), "eth7")->copyProtocol("DNS")->configuration(),
              (Dictionary{{"ServerAddresses", Array{"192.0.2.53  ", "2001:db8::53", "192.0.2.54"}}}));
}

TEST_F(NetworkManagerTest, WhatMakesNoSenseIsRefusedAndNeitherReachesTheProfileNorTheDevice) {
    addCable("eth7");
    EXPECT_EQ(configure("eth7", manual("192.0.2.7")), 0);
    const std::string id = idOf("eth7");
    for (const Dictionary& bad : std::vector<Dictionary>{
             manual("no address"), manual("192.0.2.9", "no router"), {{"ConfigMethod", "Manual"}}}) {
        EXPECT_EQ(refusal("eth7", bad), platform::kNetworkConfigInvalid);
        EXPECT_EQ(ipv4("eth7"), manual("192.0.2.7"));
        EXPECT_EQ(profile(id, "ipv4.method,ipv4.addresses"), "manual\n192.0.2.7/24");
    }
    EXPECT_EQ(refusal("eth7", {{"ConfigMethod", "Telepathy"}}), platform::kNetworkConfigUnknownMethod);
    EXPECT_EQ(refusal("eth7", manual("192.0.2.9"), {{"ServerAddresses", Array{"fe80::1%eth7"}}}),
              platform::kNetworkConfigInvalid);
    EXPECT_EQ(ipv4("eth7"), manual("192.0.2.7"));
    EXPECT_EQ(addresses("eth7"), "192.0.2.7/24");
}

TEST_F(NetworkManagerTest, WhatIsKeptAndMakesNoSenseIsReadAsTheProfileHasIt) {
    addCable("eth7");
    shell("nmcli connection add type ethernet con-name One ifname eth7 autoconnect no ipv4.method manual "
          "ipv4.addresses 192.0.2.9/24 ipv4.dns 192.0.2.53");
    shell("printf '%s\\n' '[user]' 'com.corvid.welcomer.protocols.000=<plist><dict>"
          "<key>IPv4</key><dict><key>Configuration</key><dict><key>ConfigMethod</key><string>Manual</string>"
          "</dict></dict><key>DNS</key><dict><key>Configuration</key><dict><key>ServerAddresses</key><array>"
          "<string>nonsense</string></array></dict></dict></dict></plist>' >> /run/profiles/One.nmconnection "
          "&& nmcli "
          "connection reload");
    EXPECT_EQ(ipv4("eth7"), (Dictionary{{"ConfigMethod", "Manual"},
                                        {"Addresses", Array{"192.0.2.9"}},
                                        {"SubnetMasks", Array{"255.255.255.0"}}}));
    EXPECT_EQ(serviceOf(*store.open("a test"), "eth7")->copyProtocol("DNS")->configuration(),
              (Dictionary{{"ServerAddresses", Array{"192.0.2.53"}}}));
}

TEST_F(NetworkManagerTest, AddressesThatOthersGaveStayWhereOnlyTheServersChange) {
    addCable("eth7");
    shell("nmcli connection add type ethernet con-name One ifname eth7 autoconnect no ipv4.method manual "
          "ipv4.addresses 192.0.2.8/24,192.0.2.9/25");
    const auto connection = store.open("a test");
    serviceOf(*connection, "eth7")
        ->copyProtocol("DNS")
        ->setConfiguration({{"ServerAddresses", Array{"192.0.2.53"}}});
    EXPECT_TRUE(connection->commitChanges());
    EXPECT_EQ(profile("One", "ipv4.addresses,ipv4.dns"), "192.0.2.8/24, 192.0.2.9/25\n192.0.2.53");
    EXPECT_EQ(ipv4("eth7").at("Addresses"), PropertyList(Array{"192.0.2.8", "192.0.2.9"}));
}

TEST_F(NetworkManagerTest, AProfileThatIsGoneIsAnError) {
    addCable("eth7");
    EXPECT_EQ(configure("eth7", manual("192.0.2.7")), 0);
    const auto connection = store.open("a test");
    serviceOf(*connection, "eth7")->copyProtocol("IPv4")->setConfiguration(manual("192.0.2.8"));
    shell("nmcli connection delete " + idOf("eth7"));
    EXPECT_FALSE(connection->commitChanges());
    EXPECT_EQ(connection->lastErrorCode(), platform::kNetworkConfigNotFound);
}

// Applying

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
