#include "backends/local/network/MachineInterfaces.h"

#include "backends/local/network/WirelessLinks.h"
#include "backends/posix/KernelNetwork.h"

#include <algorithm>
#include <array>
#include <net/if.h>
#include <net/if_arp.h>
#include <string_view>

namespace welcomer::local {

namespace {

constexpr char kOtherType[] = "Other";

// The kinds of links that stand on another link, and those that have ports.
struct Kind {
    std::string_view name;
    const char* type;
};
constexpr std::array<Kind, 8> kStackedKinds = {{{"vlan", platform::kNetworkVLAN},
                                                {"macvlan", "MACVLAN"},
                                                {"macvtap", "MACVLAN"},
                                                {"ipvlan", "IPVLAN"},
                                                {"ipvtap", "IPVLAN"},
                                                {"macsec", "MACsec"},
                                                {"bridge", platform::kNetworkBridge},
                                                {"bond", platform::kNetworkBond}}};

const Kind* stackedKind(const posix::KernelLink& link) {
    const auto* const found = std::ranges::find(kStackedKinds, std::string_view(link.kind), &Kind::name);
    return found == kStackedKinds.end() ? nullptr : found;
}

bool hasPorts(const posix::KernelLink& link) {
    return link.kind == "bridge" || link.kind == "bond";
}

std::string typeOf(const posix::KernelLink& link, const std::set<int>& wireless) {
    if (const Kind* kind = stackedKind(link)) {
        return kind->type;
    }
    if (wireless.contains(link.index)) {
        return platform::kNetworkWireless;
    }
    return link.hardwareType == ARPHRD_ETHER ? platform::kNetworkEthernet : kOtherType;
}

const MachineLink* named(const std::vector<MachineLink>& links, const std::string& device) {
    const auto found =
        std::ranges::find_if(links, [&](const MachineLink& each) { return each.link.name == device; });
    return found == links.end() ? nullptr : &*found;
}

// The link that another one stands on, or null.
const MachineLink* below(const std::vector<MachineLink>& links, const posix::KernelLink& link) {
    if (!stackedKind(link)) {
        return nullptr;
    }
    const auto found = hasPorts(link) ? std::ranges::find_if(links,
                                                             [&](const MachineLink& each) {
                                                                 return each.link.masterIndex == link.index;
                                                             })
                                      : std::ranges::find_if(links, [&](const MachineLink& each) {
                                            return each.link.index == link.linkIndex;
                                        });
    return found == links.end() ? nullptr : &*found;
}

class LocalInterface final : public platform::NetworkInterface {
  public:
    LocalInterface(const std::vector<MachineLink>& links, const MachineLink& link, std::set<int> above)
        : _type(link.type),
          _device(link.link.name) {
        above.insert(link.link.index);
        const MachineLink* underlying = below(links, link.link);
        if (underlying && !above.contains(underlying->link.index)) {
            _underlying = std::make_unique<LocalInterface>(links, *underlying, std::move(above));
        }
    }
    explicit LocalInterface(std::string device) : _device(std::move(device)) {}

    std::optional<std::string> type() const override { return _type; }
    std::optional<std::string> deviceName() const override { return _device; }
    std::optional<std::string> displayName() const override {
        return _type ? displayNameOf(*_type, _device) : _device;
    }
    platform::NetworkInterface* underlyingInterface() const override { return _underlying.get(); }

  private:
    const std::optional<std::string> _type;
    const std::string _device;
    std::unique_ptr<LocalInterface> _underlying;
};

} // namespace

std::vector<MachineLink> listMachineLinks() {
    return listMachineLinks(posix::KernelNetwork().links(), wirelessLinks());
}

std::vector<MachineLink> listMachineLinks(const std::vector<posix::KernelLink>& links,
                                          const std::set<int>& wireless) {
    std::vector<MachineLink> found;
    found.reserve(links.size());
    for (const posix::KernelLink& link : links) {
        if ((link.flags & IFF_LOOPBACK) == 0) {
            found.push_back({link, typeOf(link, wireless)});
        }
    }
    return found;
}

bool isPort(const std::vector<MachineLink>& links, const std::string& device) {
    const MachineLink* const found = named(links, device);
    return found && std::ranges::any_of(links, [&](const MachineLink& each) {
               return each.link.index == found->link.masterIndex && hasPorts(each.link);
           });
}

std::vector<MachineLink> listHardware(const std::vector<MachineLink>& links) {
    std::vector<MachineLink> hardware;
    std::ranges::copy_if(links, std::back_inserter(hardware), [&](const MachineLink& each) {
        const bool isPlain =
            each.type == platform::kNetworkEthernet || each.type == platform::kNetworkWireless;
        const bool hasTakenOver = hasPorts(each.link) && below(links, each.link);
        return each.link.masterIndex == 0 && (isPlain || hasTakenOver);
    });
    return hardware;
}

std::unique_ptr<platform::NetworkInterface> makeInterface(const std::vector<MachineLink>& links,
                                                          const std::string& device) {
    const MachineLink* const found = named(links, device);
    return found ? makeInterface(links, *found) : std::make_unique<LocalInterface>(device);
}

std::unique_ptr<platform::NetworkInterface> makeInterface(const std::vector<MachineLink>& links,
                                                          const MachineLink& link) {
    return std::make_unique<LocalInterface>(links, link, std::set<int>());
}

std::string displayNameOf(const std::string& type, const std::string& device) {
    return type + " (" + device + ")";
}

} // namespace welcomer::local
