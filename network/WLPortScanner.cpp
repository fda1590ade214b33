#include "network/WLPortScanner.h"

#include "platform/Platform.h"

namespace welcomer {

namespace {

constexpr char kBluetoothModem[] = "Bluetooth-Modem";
constexpr char kModem[] = "Modem";

void setEntry(PropertyList::Dictionary& port, const char* key, const std::optional<std::string>& value) {
    if (value) {
        port.emplace(key, *value);
    }
}

} // namespace

WLPortScanner::WLPortScanner() : _interfaceArray(platform::current().networkConfigStore.copyInterfaces()) {}

std::optional<std::string> WLPortScanner::deviceAtIndex(std::uint64_t index) const {
    const auto& interface = _interfaceArray.at(index);
    return interface ? interface->deviceName() : std::nullopt;
}

std::optional<std::string> WLPortScanner::portKindAtIndex(std::uint64_t index) const {
    const auto& interface = _interfaceArray.at(index);
    std::optional<std::string> type = interface ? interface->type() : std::nullopt;
    return type == platform::kNetworkIEEE80211 ? platform::kNetworkWireless : type;
}

std::optional<std::string> WLPortScanner::nameAtIndex(std::uint64_t index) const {
    const auto& interface = _interfaceArray.at(index);
    return interface ? interface->displayName() : std::nullopt;
}

std::vector<PropertyList::Dictionary> machinePortList() {
    const WLPortScanner scanner;
    const auto count = static_cast<std::int16_t>(scanner.count()); // narrow on purpose
    std::vector<PropertyList::Dictionary> ports;
    for (std::int16_t index = 0; index < count; ++index) {
        const auto slot = static_cast<std::uint64_t>(index);
        const std::optional<std::string> device = scanner.deviceAtIndex(slot);
        if (device == kBluetoothModem) {
            continue;
        }
        std::optional<std::string> kind = scanner.portKindAtIndex(slot);
        if (kind == "SerialModem" || kind == "USBModem") {
            kind = kModem;
        }
        PropertyList::Dictionary& port = ports.emplace_back();
        setEntry(port, WLMachinePortName, scanner.nameAtIndex(slot));
        setEntry(port, WLMachinePortUID, device);
        setEntry(port, WLMachinePortConnectionType, kind);
    }
    return ports;
}

} // namespace welcomer
