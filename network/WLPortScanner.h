// The network interfaces (ports) of the machine.

#pragma once

#include "platform/NetworkConfigStore.h"
#include "propertylist/PropertyList.h"

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace welcomer {

// The entries of a port dictionary: the device name, the name for people and the kind.
inline constexpr char WLMachinePortUID[] = "WLMachinePortUID";
inline constexpr char WLMachinePortName[] = "WLMachinePortName";
inline constexpr char WLMachinePortConnectionType[] = "WLMachinePortConnectionType";

// A snapshot of all interfaces; a new one sees new ports. An index beyond the last port throws
// std::out_of_range. Any thread.
class WLPortScanner {
  public:
    // Takes the snapshot.
    WLPortScanner();

    std::uint64_t count() const { return _interfaceArray.size(); }

    // The port's device name, none when there is no interface at that slot.
    std::optional<std::string> deviceAtIndex(std::uint64_t index) const;

    // The port's interface type; an 802.11 interface is reported under the hardware key of wireless services.
    std::optional<std::string> portKindAtIndex(std::uint64_t index) const;

    // The port's name for people.
    std::optional<std::string> nameAtIndex(std::uint64_t index) const;

  private:
    const std::vector<std::shared_ptr<platform::NetworkInterface>> _interfaceArray;
};

// One dictionary of three strings for each port of the machine; an entry that the port has no value for is
// left out. The ports are counted in 16 bits with a sign: from 32,768 on there are none, from 65,536 on the
// count begins anew. Any thread.
std::vector<PropertyList::Dictionary> machinePortList();

} // namespace welcomer
