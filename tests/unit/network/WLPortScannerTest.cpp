#include "network/WLPortScanner.h"

#include "tests/fakes/FakePlatform.h"

#include <gtest/gtest.h>

#include <stdexcept>
#include <string>
#include <vector>

namespace welcomer {
namespace {

class WLPortScannerTest : public testing::Test {
  protected:
    void addPort(const std::optional<std::string>& type, const std::optional<std::string>& device,
                 const std::optional<std::string>& name = "a port") {
        fake.networkConfigStore.interfaces.push_back({{type, device, name}});
    }
    static PropertyList::Dictionary port(const std::string& name, const std::string& device,
                                         const std::string& kind) {
        return {
            {"WLMachinePortName", name}, {"WLMachinePortUID", device}, {"WLMachinePortConnectionType", kind}};
    }

    fakes::FakePlatform fake;
    const platform::ScopedPlatform installed{fake.platform()};
};

TEST_F(WLPortScannerTest, ThePortsAreThoseOfTheMachineInItsOrder) {
    addPort("Ethernet", "eth1", "Wired");
    addPort("Bridge", "br0", "Bridge");
    const WLPortScanner scanner;
    EXPECT_EQ(scanner.count(), 2U);
    EXPECT_EQ(scanner.deviceAtIndex(0), "eth1");
    EXPECT_EQ(scanner.portKindAtIndex(0), "Ethernet");
    EXPECT_EQ(scanner.nameAtIndex(0), "Wired");
    EXPECT_EQ(scanner.deviceAtIndex(1), "br0");
    EXPECT_EQ(scanner.portKindAtIndex(1), "Bridge");
}

TEST_F(WLPortScannerTest, An80211InterfaceIsReportedUnderTheWirelessHardwareKey) {
    addPort("IEEE80211", "wlan0");
    addPort("Wireless", "wlan1");
    addPort("ieee80211", "other");
    const WLPortScanner scanner;
    EXPECT_EQ(scanner.portKindAtIndex(0), "Wireless");
    EXPECT_EQ(scanner.portKindAtIndex(1), "Wireless");
    EXPECT_EQ(scanner.portKindAtIndex(2), "ieee80211");
}

TEST_F(WLPortScannerTest, TheSnapshotIsNeverRefreshed) {
    addPort("Ethernet", "eth0");
    const WLPortScanner scanner;
    addPort("Ethernet", "eth1");
    EXPECT_EQ(scanner.count(), 1U);
    EXPECT_EQ(WLPortScanner().count(), 2U);
    EXPECT_EQ(fake.recorder.callsTo("NetworkConfigStore.copyInterfaces").size(), 2U);
}

TEST_F(WLPortScannerTest, AnIndexBeyondTheLastPortIsOutOfRange) {
    addPort("Ethernet", "eth0");
    const WLPortScanner scanner;
    EXPECT_THROW(scanner.deviceAtIndex(1), std::out_of_range);
    EXPECT_THROW(scanner.portKindAtIndex(1), std::out_of_range);
    EXPECT_THROW(scanner.nameAtIndex(~std::uint64_t{0}), std::out_of_range);
}

TEST_F(WLPortScannerTest, ASlotWithoutAnInterfaceHasNoDevice) {
    fake.networkConfigStore.interfaces.emplace_back();
    const WLPortScanner scanner;
    EXPECT_EQ(scanner.count(), 1U);
    EXPECT_EQ(scanner.deviceAtIndex(0), std::nullopt);
    EXPECT_EQ(scanner.portKindAtIndex(0), std::nullopt);
    EXPECT_EQ(scanner.nameAtIndex(0), std::nullopt);
}

// The list

TEST_F(WLPortScannerTest, TheListHasNameDeviceAndKindOfEachPort) {
    addPort("Ethernet", "eth0", "Wired");
    addPort("IEEE80211", "wlan0", "Radio");
    EXPECT_EQ(machinePortList(),
              (std::vector{port("Wired", "eth0", "Ethernet"), port("Radio", "wlan0", "Wireless")}));
}

TEST_F(WLPortScannerTest, AMachineWithoutPortsHasAnEmptyList) {
    EXPECT_TRUE(machinePortList().empty());
}

TEST_F(WLPortScannerTest, TheBluetoothModemIsNeverListed) {
    addPort("SerialModem", "Bluetooth-Modem");
    addPort("Ethernet", "Bluetooth-modem");
    EXPECT_EQ(machinePortList(), (std::vector{port("a port", "Bluetooth-modem", "Ethernet")}));
}

TEST_F(WLPortScannerTest, SerialAndUSBModemsAreModems) {
    addPort("SerialModem", "cu0");
    addPort("USBModem", "cu1");
    addPort("Modem", "cu2");
    addPort("OtherModem", "cu3");
    std::vector<std::string> kinds;
    for (const PropertyList::Dictionary& each : machinePortList()) {
        kinds.push_back(*each.at("WLMachinePortConnectionType").string());
    }
    EXPECT_EQ(kinds, (std::vector<std::string>{"Modem", "Modem", "Modem", "OtherModem"}));
}

TEST_F(WLPortScannerTest, AValueThatAPortLacksIsLeftOut) {
    addPort(std::nullopt, "eth0", std::nullopt);
    EXPECT_EQ(machinePortList(), (std::vector<PropertyList::Dictionary>{{{"WLMachinePortUID", "eth0"}}}));
}

TEST_F(WLPortScannerTest, ThePortsAreCountedInSixteenBitsWithASign) {
    const auto listedOf = [&](std::size_t count) {
        fake.networkConfigStore.interfaces.assign(count, {{"Ethernet", "eth0", "Wired"}});
        return machinePortList().size();
    };
    EXPECT_EQ(listedOf(32767), 32767U);
    EXPECT_EQ(listedOf(32768), 0U);
    EXPECT_EQ(listedOf(65535), 0U);
    EXPECT_EQ(listedOf(65536), 0U);
    EXPECT_EQ(listedOf(65539), 3U);
}

} // namespace
} // namespace welcomer
