// What the configuration store on the kernel keeps in its file. Each test has a network namespace of its own.

#include "tests/contract/NetworkStoresFixture.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <string>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>
#include <vector>

namespace welcomer {
namespace {

const std::string kFile = "/var/lib/welcomer/network.plist";

class LocalNetworkConfigStoreTest : public KernelNetworkStores {};

TEST_F(LocalNetworkConfigStoreTest, WhatSysShowsOfAnotherNetworkIsNotOfThisOne) {
    addPair("wlan7");
    root.addDirectory("/sys/class/net/wlan7/phy80211");
    root.addDirectory("/sys/class/ieee80211/phy0");
    EXPECT_EQ(interfaces(), (std::vector<std::string>{"Ethernet p-wlan7", "Ethernet wlan7"}));
}

TEST_F(LocalNetworkConfigStoreTest, AThousandLinksAreAllListed) {
    shell("for i in $(seq 500); do echo link add v$i type veth peer name w$i; done | ip -batch -");
    EXPECT_EQ(store().copyInterfaces().size(), 1000U);
    EXPECT_EQ(store().open("a test")->copyCurrentSet()->copyServices()->size(), 1000U);
}

TEST_F(LocalNetworkConfigStoreTest, HardwareHasAServiceThatIsStoredWhenItIsEstablished) {
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
    EXPECT_EQ(connection->lastErrorCode(), 0);

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

TEST_F(LocalNetworkConfigStoreTest, HardwareWhoseServiceWasChangedNeedsNoEstablishing) {
    addPair("eth7");
    const auto connection = store().open("a test");
    for (const char* device : {"eth7", "p-eth7"}) {
        EXPECT_TRUE(serviceOf(*connection, device)->addProtocolType("One"));
    }
    EXPECT_FALSE(connection->copyCurrentSet()->establishDefaultConfiguration());
    EXPECT_TRUE(connection->commitChanges());
    EXPECT_NE(serviceOf(*store().open("a test"), "eth7")->copyProtocol("One"), nullptr);
}

TEST_F(LocalNetworkConfigStoreTest, HardwareThatTwoConnectionsEstablishGetsOneService) {
    addPair("eth7");
    const auto first = store().open("a test");
    const auto second = store().open("another");
    EXPECT_TRUE(first->copyCurrentSet()->establishDefaultConfiguration());
    EXPECT_TRUE(second->copyCurrentSet()->establishDefaultConfiguration());
    EXPECT_TRUE(first->commitChanges());
    EXPECT_TRUE(second->commitChanges());
    EXPECT_EQ(store().open("a test")->copyCurrentSet()->copyServices()->size(), 2U);
}

TEST_F(LocalNetworkConfigStoreTest, PortsOfABridgeAndStackedLinksGetNoServiceButTheBridgeDoes) {
    shell("ip link add eth7 type veth peer name eth8 && ip link add br0 type bridge && ip link add br1 type "
          "bridge && "
          "ip link set eth7 master br0 && ip link add mac0 link eth8 type macvlan");
    EXPECT_EQ(serviceInterfaces(*store().open("a test")),
              (std::vector<std::string>{"Ethernet eth8", "Bridge br0 > Ethernet eth7"}));
}

TEST_F(LocalNetworkConfigStoreTest, AStoredDefaultConfiguresNothing) {
    addPair("eth7");
    const auto connection = store().open("a test");
    connection->copyCurrentSet()->establishDefaultConfiguration();
    EXPECT_TRUE(connection->commitChanges());
    EXPECT_TRUE(connection->applyChanges());
    EXPECT_EQ(connection->lastErrorCode(), 0);
    EXPECT_FALSE(std::filesystem::exists(root.locate("/run/welcomer")));
}

TEST_F(LocalNetworkConfigStoreTest, ChangesAreSeenHereAtOnceAndByOthersOnceCommitted) {
    addPair("eth7");
    const auto connection = store().open("a test");
    const auto other = store().open("another");
    const auto service = serviceOf(*connection, "eth7");
    EXPECT_TRUE(service->copyProtocol("IPv4")->setConfiguration({{"ConfigMethod", "BOOTP"}}));
    EXPECT_TRUE(service->addProtocolType("IPv6"));
    EXPECT_TRUE(service->setEnabled(false));
    EXPECT_EQ(service->copyProtocol("IPv4")->configuration(), (Dictionary{{"ConfigMethod", "BOOTP"}}));
    EXPECT_EQ(service->copyProtocol("IPv6")->configuration(), std::nullopt);
    EXPECT_TRUE(connection->commitChanges());
    EXPECT_EQ(serviceOf(*other, "eth7")->copyProtocol("IPv6"), nullptr);
    other->synchronize();
    EXPECT_NE(serviceOf(*other, "eth7")->copyProtocol("IPv6"), nullptr);
    EXPECT_NE(root.content(kFile)->find("<false/>"), std::string::npos);
}

TEST_F(LocalNetworkConfigStoreTest, SynchronizingDropsChanges) {
    addPair("eth7");
    const auto connection = store().open("a test");
    serviceOf(*connection, "eth7")->copyProtocol("IPv4")->setConfiguration({{"ConfigMethod", "Manual"}});
    connection->synchronize();
    EXPECT_TRUE(connection->commitChanges());
    EXPECT_TRUE(connection->applyChanges());
    EXPECT_EQ(root.content(kFile), std::nullopt);
}

TEST_F(LocalNetworkConfigStoreTest, ADamagedFileCountsAsEmptyAndIsSetAside) {
    addPair("eth7");
    root.addFile(kFile, "<plist><dict>");
    EXPECT_EQ(configure("eth7", manual("192.0.2.7", "255.255.255.0", "")), 0);
    EXPECT_EQ(root.content(kFile + ".damaged"), "<plist><dict>");
}

TEST_F(LocalNetworkConfigStoreTest, AFileWithoutTheSetItNamesHasNoCurrentSet) {
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

TEST_F(LocalNetworkConfigStoreTest, FilesThatMakeNoSenseAreReadAsEmpty) {
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

TEST_F(LocalNetworkConfigStoreTest, AFolderThatCannotBeMadeIsAWriteError) {
    addPair("eth7");
    root.addFile("/var/lib", "a file");
    const auto connection = store().open("a test");
    connection->copyCurrentSet()->establishDefaultConfiguration();
    EXPECT_FALSE(connection->commitChanges());
    EXPECT_EQ(connection->lastErrorCode(), platform::kNetworkConfigWriteFailed);
}

TEST_F(LocalNetworkConfigStoreTest, AFileThatIsNoneIsAReadError) {
    addPair("eth7");
    root.addDirectory(kFile);
    const auto connection = store().open("a test");
    connection->copyCurrentSet()->establishDefaultConfiguration();
    EXPECT_FALSE(connection->commitChanges());
    EXPECT_EQ(connection->lastErrorCode(), platform::kNetworkConfigReadFailed);
}

TEST_F(LocalNetworkConfigStoreTest, AnOrdinaryUserReadsEverythingAndIsRefusedToChangeAnything) {
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
        if (connection->commitChanges() ||
            connection->lastErrorCode() != platform::kNetworkConfigAccessDenied) {
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

TEST_F(LocalNetworkConfigStoreTest, AServiceThatIsGoneIsAnErrorAndNothingElseIsStored) {
    addPair("eth7");
    EXPECT_EQ(configure("eth7", manual("192.0.2.7", "255.255.255.0", "")), 0);
    const auto connection = store().open("a test");
    for (const char* device : {"eth7", "p-eth7"}) {
        EXPECT_TRUE(serviceOf(*connection, device)->setEnabled(false));
    }
    root.addFile(kFile, "{}");
    EXPECT_FALSE(connection->commitChanges());
    EXPECT_EQ(connection->lastErrorCode(), platform::kNetworkConfigNotFound);
    EXPECT_EQ(root.content(kFile), "{}");
}

TEST_F(LocalNetworkConfigStoreTest, WhatMakesNoSenseInTheFileStandsInNobodysWay) {
    addPair("eth7");
    root.addFile(kFile,
                 "{ Sets = { automatic = { Services = (w); }; }; Services = { w = { Device = eth7; "
                 "Protocols = { DNS = { Configuration = { ServerAddresses = (nonsense); }; }; IPv4 = { "
                 "Configuration = { ConfigMethod = Manual; Router = nonsense; }; }; }; }; }; }");
    EXPECT_EQ(configure("eth7", manual("192.0.2.7", "255.255.255.0", "")), 0) << errorText;
    EXPECT_EQ(addresses("eth7"), "192.0.2.7/24\n");
    EXPECT_EQ(stored("eth7").back(),
              (Dictionary{{"ServerAddresses", Array{"nonsense"}}})); // nobody changed it
}

TEST_F(LocalNetworkConfigStoreTest, AServiceOfADeviceThatIsNoPortStays) {
    addPair("eth7");
    EXPECT_EQ(configure("eth7", manual("192.0.2.7", "255.255.255.0", "")), 0);
    shell("ip link add br0 type bridge && ip link set p-eth7 master br0");
    const std::vector<std::string> all = serviceInterfaces(*store().open("a test"));
    EXPECT_EQ(all, (std::vector<std::string>{"Ethernet eth7", "Bridge br0 > Ethernet p-eth7"}));
}

} // namespace
} // namespace welcomer
