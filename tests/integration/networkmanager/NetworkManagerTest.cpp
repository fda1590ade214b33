// Profiles of a real NetworkManager.

#include "tests/integration/networkmanager/NetworkManagerFixture.h"
#include "tests/support/NetworkNamespace.h"

#include <vector>

namespace welcomer {
namespace {

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

} // namespace
} // namespace welcomer
