// Probing.

#include "generated/WelcomerConfiguration.h"
#include "log/PCLogManager.h"
#include "tests/unit/network/NetworkingManagerFixture.h"

#include <algorithm>
#include <cstdint>
#include <iterator>

namespace welcomer {
namespace {

using namespace std::chrono_literals;
using platform::NetworkDomain;
using platform::NetworkEntity;

const std::string kInternalAddress = std::string(configuration::kInternalAddressPrefix) + "9";

// The internet

TEST_F(NetworkingManagerTest, ProbesThePublicWebHost) {
    const std::string host(configuration::kPublicWebHost);
    EXPECT_TRUE(NetworkingManager::internetIsReachable());
    EXPECT_EQ(fake.recorder.calls(),
              (Lines{"HostReachability.createTarget " + host, "HostReachability.flags " + host}));
}

TEST_F(NetworkingManagerTest, TheInternetIsReachableExactlyWhenBitTwoIsSetAndBitFourIsClear) {
    for (std::uint32_t flags = 0; flags < 16; ++flags) {
        fake.hostReachability.flags = flags;
        EXPECT_EQ(NetworkingManager::internetIsReachable(), (flags & 6) == 2) << flags;
    }
}

TEST_F(NetworkingManagerTest, AHostReachableOnlyAfterAConnectionIsBroughtUpIsNotReachable) {
    fake.hostReachability.flags = platform::kHostReachable | platform::kHostConnectionRequired;
    EXPECT_FALSE(NetworkingManager::internetIsReachable());
}

TEST_F(NetworkingManagerTest, FlagsThatCannotBeReadAreNotReachable) {
    fake.hostReachability.flags = std::nullopt;
    EXPECT_FALSE(NetworkingManager::internetIsReachable());
}

// The maker's own network

TEST_F(NetworkingManagerTest, TheInternalNetworkTakesBothTheAddressAndTheMarker) {
    for (const bool hasMarker : {false, true}) {
        if (hasMarker) {
            fake.fileSystem.addDirectory("/CorvidInternal");
        }
        setWholeState();
        EXPECT_FALSE(NetworkingManager::isOnCorvidInternalNetwork());
        setState(serviceKey(NetworkDomain::State, "one"), {{"Addresses", Array{kInternalAddress}}});
        EXPECT_EQ(NetworkingManager::isOnCorvidInternalNetwork(), hasMarker);
        setState(serviceKey(NetworkDomain::State, "one"), {{"Addresses", Array{"1" + kInternalAddress}}});
        EXPECT_FALSE(NetworkingManager::isOnCorvidInternalNetwork());
    }
}

TEST_F(NetworkingManagerTest, TheCurrentAddressIsReadAsTheDefaultsAreWithTheMethodReadAndDropped) {
    setWholeState();
    NetworkingManager::isOnCorvidInternalNetwork();
    EXPECT_EQ(fake.recorder.callsTo("NetworkStateStore."),
              (Lines{"NetworkStateStore.open Welcomer", "NetworkStateStore.copyValue State, global, IPv4",
                     "NetworkStateStore.copyValue Setup, service one, IPv4",
                     "NetworkStateStore.copyValue State, service one, IPv4", "NetworkStateStore.close"}));
}

TEST_F(NetworkingManagerTest, WithoutAnyStateThisIsNotTheInternalNetwork) {
    fake.fileSystem.addDirectory("/CorvidInternal");
    EXPECT_FALSE(NetworkingManager::isOnCorvidInternalNetwork());
    setState(globalKey(NetworkEntity::IPv4), {{"Router", "192.0.2.1"}});
    EXPECT_FALSE(NetworkingManager::isOnCorvidInternalNetwork());
    setState(globalKey(NetworkEntity::IPv4), {{"PrimaryService", "one"}});
    EXPECT_FALSE(NetworkingManager::isOnCorvidInternalNetwork());
    for (const Array& addresses : {Array(), Array{""}}) {
        setState(serviceKey(NetworkDomain::State, "one"), {{"Addresses", addresses}});
        EXPECT_FALSE(NetworkingManager::isOnCorvidInternalNetwork());
    }
    setState(serviceKey(NetworkDomain::State, "one"), {{"Addresses", Array{kInternalAddress}}});
    fake.networkStateStore.cannotOpen = true;
    EXPECT_FALSE(NetworkingManager::isOnCorvidInternalNetwork());
}

// The cable

TEST_F(NetworkingManagerTest, OnlyTheServiceWhoseLinkIsActiveHasItsCableIn) {
    store.services = {service("first", "eth0"), service("second", "eth1"),
                      service("radio", "wlan0", "Wireless")};
    setLink("eth0", false);
    setLink("eth1", true);
    setLink("wlan0", true);
    NetworkingManager& made = openManager();
    const auto plugged = made.servicesWithEthernetPluggedIn();
    ASSERT_TRUE(plugged);
    ASSERT_EQ(plugged->size(), 1U);
    EXPECT_EQ(plugged->front()->serviceID(), "second");
    EXPECT_TRUE(made.isEthernetCablePluggedIn());
}

TEST_F(NetworkingManagerTest, TheLinkIsAskedForUnderItsOwnClientName) {
    store.services = {service("first", "eth0")};
    openManager().isEthernetCablePluggedIn();
    EXPECT_EQ(fake.recorder.callsTo("NetworkStateStore."),
              (Lines{"NetworkStateStore.open FirstRun",
                     "NetworkStateStore.copyValue State, interface eth0, Link", "NetworkStateStore.close"}));
}

TEST_F(NetworkingManagerTest, TheCableIsThatOfTheEthernetInterfaceInTheChain) {
    store.services = {service("bridge", "br0", "Bridge")};
    store.services[0].chain.push_back({"Ethernet", "eth0", "Ethernet (eth0)"});
    setLink("br0", false);
    setLink("eth0", true);
    EXPECT_TRUE(openManager().isEthernetCablePluggedIn());
}

TEST_F(NetworkingManagerTest, ALinkThatIsUnknownOrSaysNothingIsNotActive) {
    store.services = {service("first", "eth0")};
    NetworkingManager& made = openManager();
    EXPECT_FALSE(made.isEthernetCablePluggedIn());
    const Key key = Key::interface(NetworkDomain::State, "eth0", NetworkEntity::Link);
    for (const Dictionary& value :
         {Dictionary(), Dictionary{{"Active", "yes"}}, Dictionary{{"Active", false}}}) {
        setState(key, value);
        EXPECT_FALSE(made.isEthernetCablePluggedIn());
    }
    setLink("eth0", true);
    EXPECT_TRUE(made.isEthernetCablePluggedIn());
    fake.networkStateStore.cannotOpen = true;
    EXPECT_FALSE(made.isEthernetCablePluggedIn());
}

TEST_F(NetworkingManagerTest, AnInterfaceWithoutADeviceHasNoCable) {
    store.services = {service("first", "eth0")};
    store.services[0].chain[0].device = std::nullopt;
    EXPECT_FALSE(openManager().isEthernetCablePluggedIn());
    EXPECT_EQ(fake.recorder.callsTo("NetworkStateStore."), Lines());
}

TEST_F(NetworkingManagerTest, ServicesThatCannotBeListedAreNoneAndWithoutACable) {
    NetworkingManager& made = openManager();
    EXPECT_TRUE(made.servicesWithEthernetPluggedIn());
    store.cannotListServices = true;
    EXPECT_FALSE(made.servicesWithEthernetPluggedIn());
    EXPECT_FALSE(made.isEthernetCablePluggedIn());
    store.cannotListServices = false;
    store.hasSet = false;
    EXPECT_FALSE(made.servicesWithEthernetPluggedIn());
    EXPECT_FALSE(made.isEthernetCablePluggedIn());
}

// Dynamic configuration

class DynamicConfigurationTest : public NetworkingManagerTest {
  protected:
    NetworkingManager& managerWithMethod(const std::string& method) {
        store.services = {service("wired", "eth0")};
        store.services[0].protocols = {{"IPv4", Dictionary{{"ConfigMethod", method}}}};
        return openManager();
    }
};

TEST_F(DynamicConfigurationTest, AReachableHostMakesItUsable) {
    for (const std::string method : {"BOOTP", "DHCP", "LinkLocal"}) {
        fake.hostReachability.flags = platform::kHostReachable;
        EXPECT_TRUE(managerWithMethod(method).hasUsableDynamicEthernetConfiguration());
        const std::string first =
            "NetworkingManager: hasUsableDynamicEthernetConfiguration: (configMethod " + method + ")";
        EXPECT_EQ(logged(), (Lines{first, "hasUsableDynamicEthernetConfiguration: reg. host reachable."}));
        fake.hostReachability.flags = 0U;
        EXPECT_FALSE(manager->hasUsableDynamicEthernetConfiguration());
        EXPECT_EQ(logged(),
                  (Lines{first, "hasUsableDynamicEthernetConfiguration: reg. host *NOT* reachable."}));
    }
}

TEST_F(DynamicConfigurationTest, AnAddressOfThePrimaryServiceMakesItUnusableWithoutProbing) {
    for (const char* address : {"192.0.2.7", "169.254.1.1"}) {
        setWholeState();
        setState(serviceKey(NetworkDomain::State, "one"), {{"Addresses", Array{address}}});
        EXPECT_FALSE(managerWithMethod("DHCP").hasUsableDynamicEthernetConfiguration());
        EXPECT_EQ(logged(),
                  (Lines{"NetworkingManager: hasUsableDynamicEthernetConfiguration: (configMethod DHCP)"}));
        EXPECT_EQ(fake.recorder.callsTo("HostReachability."), Lines());
    }
}

TEST_F(DynamicConfigurationTest, AnEmptyAddressOfThePrimaryServiceIsNone) {
    setWholeState();
    for (const Array& addresses : {Array{""}, Array{}}) {
        setState(serviceKey(NetworkDomain::State, "one"), {{"Addresses", addresses}});
        EXPECT_TRUE(managerWithMethod("DHCP").hasUsableDynamicEthernetConfiguration());
    }
}

TEST_F(DynamicConfigurationTest, AnotherMethodIsNotUsable) {
    for (const std::string method : {"Manual", "INFORM", "BootP", "dhcp", ""}) {
        EXPECT_FALSE(managerWithMethod(method).hasUsableDynamicEthernetConfiguration());
        EXPECT_EQ(logged(),
                  (Lines{"NetworkingManager: hasUsableDynamicEthernetConfiguration: (configMethod " + method +
                         ")"}));
        EXPECT_EQ(fake.recorder.callsTo("HostReachability."), Lines());
    }
}

TEST_F(DynamicConfigurationTest, WithoutASetAServiceAProtocolOrAMethodItIsSilentlyUnusable) {
    NetworkingManager& made = managerWithMethod("DHCP");
    store.services[0].protocols = {{"IPv4", Dictionary()}};
    EXPECT_FALSE(made.hasUsableDynamicEthernetConfiguration());
    store.services[0].protocols = {{"IPv4", std::nullopt}};
    EXPECT_FALSE(made.hasUsableDynamicEthernetConfiguration());
    store.services[0].protocols = {};
    EXPECT_FALSE(made.hasUsableDynamicEthernetConfiguration());
    store.services = {service("radio", "wlan0", "Wireless")};
    EXPECT_FALSE(made.hasUsableDynamicEthernetConfiguration());
    store.hasSet = false;
    EXPECT_FALSE(made.hasUsableDynamicEthernetConfiguration());
    EXPECT_EQ(logged(), Lines());
}

// Directories

TEST_F(NetworkingManagerTest, ASearchPathOfLocalNodesIsNoDirectoryAndOneLine) {
    manager.emplace();
    fake.recorder.clear();
    logged();
    fake.directoryService.subnodes = {"local", "local two", "local three", "local four"};
    EXPECT_FALSE(manager->dirServiceNodesExist());
    EXPECT_EQ(
        logged(),
        (Lines{"NetworkingManager: DirService: search paths: (local, local two, local three, local four)"}));
    EXPECT_EQ(fake.recorder.callsTo("DirectoryService."),
              (Lines{"DirectoryService.openNode 8705", "DirectoryService.subnodeNames"}));
    fake.directoryService.subnodes = {};
    EXPECT_FALSE(manager->dirServiceNodesExist());
    EXPECT_EQ(logged(), (Lines{"NetworkingManager: DirService: search paths: ()"}));
}

TEST_F(NetworkingManagerTest, AtLeastThreeReachableNodesAreEnough) {
    manager.emplace();
    logged();
    fake.directoryService.subnodes = {"local", "a", "b"};
    fake.directoryService.unreachable = {"a"};
    EXPECT_FALSE(manager->dirServiceNodesExist());
    EXPECT_EQ(logged(), (Lines{"NetworkingManager: DirService: search paths: (local, a, b)",
                               "NetworkingManager: DirService: subnodeNames (local, a, b)",
                               "NetworkingManager: DirService: unreachableSubnodeNames (a)",
                               "NetworkingManager: DirService: reachableNodes 2"}));
    fake.directoryService.subnodes = {"local", "a", "b", "c"};
    EXPECT_TRUE(manager->dirServiceNodesExist());
    EXPECT_EQ(logged().back(), "NetworkingManager: DirService: reachableNodes 3");
    fake.directoryService.unreachable = {"elsewhere"};
    EXPECT_TRUE(manager->dirServiceNodesExist());
}

TEST_F(NetworkingManagerTest, TheSearchPathIsReadAgainBeforeItsNodesAreCounted) {
    manager.emplace();
    fake.directoryService.subnodes = {"local", "a"};
    PCLogManager::sharedManager().setObserver([&](const PCLogManager::Call& call) {
        if (call.message.find("search paths") != std::string::npos) {
            fake.directoryService.subnodes = {"local", "a", "b"};
        }
    });
    EXPECT_TRUE(manager->dirServiceNodesExist());
    PCLogManager::sharedManager().setObserver({});
    EXPECT_EQ(fake.recorder.callsTo("DirectoryService."),
              (Lines{"DirectoryService.openNode 8705", "DirectoryService.subnodeNames",
                     "DirectoryService.openNode 8705", "DirectoryService.subnodeNames",
                     "DirectoryService.unreachableSubnodeNames"}));
}

TEST_F(NetworkingManagerTest, BothListsOfNodesAreReadBeforeTheyAreLogged) {
    manager.emplace();
    fake.directoryService.subnodes = {"local", "a", "b"};
    EXPECT_TRUE(manager->dirServiceNodesExist());
    const Lines calls = fake.recorder.calls();
    const auto read = std::ranges::find(calls, "DirectoryService.unreachableSubnodeNames");
    ASSERT_NE(read, calls.end());
    EXPECT_EQ(*std::next(read),
              "SystemLog.write 115, NetworkingManager: DirService: subnodeNames (local, a, b)");
}

TEST_F(NetworkingManagerTest, FewerThanThreeNodesAreNotCounted) {
    manager.emplace();
    logged();
    fake.directoryService.subnodes = {"local", "a"};
    EXPECT_FALSE(manager->dirServiceNodesExist());
    EXPECT_EQ(logged(), (Lines{"NetworkingManager: DirService: search paths: (local, a)"}));
    EXPECT_EQ(fake.recorder.callsTo("DirectoryService.unreachable"), Lines());
}

TEST_F(NetworkingManagerTest, ADirectoryNodeThatCannotBeOpenedIsAsAnEmptyPathOrTheEnd) {
    manager.emplace();
    logged();
    fake.directoryService.subnodes = {"local", "a", "b"};
    fake.directoryService.openings = 0;
    EXPECT_FALSE(manager->dirServiceNodesExist());
    EXPECT_EQ(logged(), (Lines{"NetworkingManager: DirService: search paths: ()"}));
    fake.directoryService.openings = 1;
    EXPECT_FALSE(manager->dirServiceNodesExist());
    EXPECT_EQ(logged(), (Lines{"NetworkingManager: DirService: search paths: (local, a, b)"}));
}

} // namespace
} // namespace welcomer
