// The kernel's messages about links, addresses and routes, taken apart and put together.

#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <linux/netlink.h>
#include <optional>
#include <string>
#include <string_view>
#include <type_traits>
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
    int linkIndex = 0; // of several hops, the first one's, as the gateway
    std::optional<IPv4Address> gateway;
    std::uint32_t metric = 0;
    bool isShared = false; // whether it has hops on other links too
    bool isUsable = true;  // whether it leads anywhere: others say that there is no way
    friend bool operator==(const KernelRoute&, const KernelRoute&) = default;
};

// What a message says, or none when it is cut off, makes no sense or is about something else: another family,
// a route that is no default route of the main table. Any thread, as all of this.
std::optional<KernelLink> readLink(const nlmsghdr& message);
std::optional<KernelAddress> readAddress(const nlmsghdr& message);
std::optional<KernelRoute> readDefaultRoute(const nlmsghdr& message);

// Shows the attributes in a piece of memory, which begins where an attribute may, with their types, flag bits
// removed.
//  result  false when they are cut off or make no sense; `take` has then seen what comes before
bool readAttributes(const void* begin, std::size_t size,
                    const std::function<void(int type, const nlattr& attribute)>& take);

// What an attribute holds: the bytes, which live as long as its message; a number, which is 0 when it is none of
// that size; and a text, which may or may not end with a zero byte.
std::string_view dataIn(const nlattr& attribute);
std::uint32_t numberIn(const nlattr& attribute);
std::uint16_t shortNumberIn(const nlattr& attribute);
std::string textIn(const nlattr& attribute);

// A request: a header, a body and attributes.
class NetlinkRequest {
  public:
    //  type     RTM_... or another family's
    //  flags    NLM_F_... besides NLM_F_REQUEST
    //  body     the structure that messages of this type begin with
    //  payload  that and attributes, as a message had them
    template <class Body>
    requires std::is_aggregate_v<Body> NetlinkRequest(std::uint16_t type, std::uint16_t flags,
                                                      const Body& body)
        : NetlinkRequest(type, flags, std::string_view(reinterpret_cast<const char*>(&body), sizeof body)) {}
    NetlinkRequest(std::uint16_t type, std::uint16_t flags, std::string_view payload);

    void addNumber(std::uint16_t type, std::uint32_t value);
    void addAddress(std::uint16_t type, IPv4Address address);  // in the network's byte order
    void addText(std::uint16_t type, const std::string& text); // with a zero byte

    // An attribute that holds what `add` adds: others, behind a structure where there is one.
    template <class Add>
    void addNested(std::uint16_t type, const Add& add) {
        const std::size_t begin = _open(type);
        add();
        _close(begin);
    }
    template <class Body>
    void addBody(const Body& body) {
        _append(std::string_view(reinterpret_cast<const char*>(&body), sizeof body));
    }

    // The whole, to be sent; valid until something is added.
    nlmsghdr& message() { return *reinterpret_cast<nlmsghdr*>(_bytes.data()); }

  private:
    std::size_t _open(std::uint16_t type);
    void _close(std::size_t begin);
    void _append(std::string_view data);

    std::vector<char> _bytes; // the message, which says its own length
};

} // namespace welcomer::posix
