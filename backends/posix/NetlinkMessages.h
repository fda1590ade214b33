// The kernel's messages about links, addresses and routes, taken apart and put together.

#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace welcomer::posix {

// A network link of the kernel.
struct KernelLink {
    int index = 0;
    std::string name;
    unsigned short hardwareType = 0; // ARPHRD_...
    unsigned int flags = 0;          // IFF_...
    std::string kind;                // "bridge", "veth" and so on; empty for what no other link made
    int linkIndex = 0;   // the link that this one stands on, or its peer; 0: none in this namespace
    int masterIndex = 0; // the bridge or bond that it is a port of; 0: none

    // Whether it is up and has a carrier.
    bool isActive() const;
    friend bool operator==(const KernelLink&, const KernelLink&) = default;
};

// An IPv4 address in the host's byte order.
using IPv4Address = std::uint32_t;

// An IPv4 address of a link.
struct KernelAddress {
    int linkIndex = 0;
    IPv4Address address = 0;
    int prefixLength = 0; // 0 to 32
    friend bool operator==(const KernelAddress&, const KernelAddress&) = default;
};

// An IPv4 default route of the main table.
struct KernelRoute {
    int linkIndex = 0;
    std::optional<IPv4Address> gateway;
    std::uint32_t metric = 0;
    friend bool operator==(const KernelRoute&, const KernelRoute&) = default;
};

// One message of a datagram; its payload is borrowed from that.
struct NetlinkMessage {
    std::uint16_t type = 0;
    std::uint16_t flags = 0;
    std::uint32_t sequence = 0;
    std::string_view payload;
};

// Shows the messages of a datagram in order, until `take` returns false.
//  result  false when the datagram is cut off or makes no sense; `take` has then seen what comes before
// Any thread, as all of this.
bool readNetlinkMessages(std::string_view datagram, const std::function<bool(const NetlinkMessage&)>& take);

// What a message's payload says, or none when it is cut off, makes no sense or is about something else:
// another family, a route that is no default route of the main table, or one that cannot be used.
std::optional<KernelLink> readLink(std::string_view payload);
std::optional<KernelAddress> readAddress(std::string_view payload);
std::optional<KernelRoute> readDefaultRoute(std::string_view payload);

// A request: a header, a body and attributes.
class NetlinkRequest {
  public:
    //  type   RTM_...
    //  flags  NLM_F_... besides NLM_F_REQUEST
    template <class Body>
    NetlinkRequest(std::uint16_t type, std::uint16_t flags, const Body& body) {
        _begin(type, flags);
        _append(&body, sizeof body);
    }

    void addAttribute(std::uint16_t type, const void* data, std::size_t size);
    void addNumber(std::uint16_t type, std::uint32_t value) { addAttribute(type, &value, sizeof value); }
    void addAddress(std::uint16_t type, IPv4Address address); // in the network's byte order

    // The bytes to send, with this sequence number.
    std::string_view bytes(std::uint32_t sequence);

  private:
    void _begin(std::uint16_t type, std::uint16_t flags);
    void _append(const void* data, std::size_t size); // and pads it

    std::string _bytes;
};

} // namespace welcomer::posix
