// What a network service asks of a machine, read from what is configured and checked.

#pragma once

#include "backends/network/IPv4Text.h"
#include "propertylist/PropertyList.h"

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

namespace welcomer::network {

struct IPv4Configuration {
    enum class Method {
        Unset,     // the device stays as it is
        DHCP,      // everything is asked for, with the client ID where there is one
        BootP,     // everything is asked for
        Inform,    // the address is this one; what else the network tells is welcome
        Manual,    // all is said here
        LinkLocal, // an address that the machine picks for this link alone
    };

    Method method = Method::Unset;
    IPv4Address address = 0;           // of "inform" and "manual"
    std::optional<int> prefixLength;   // 1 to 32; there with an address
    std::optional<IPv4Address> router; // lies on the address's network; there at most with an address
    std::string clientID;              // empty: none; with DHCP alone
    std::vector<std::string> servers;  // name servers of both kinds, with any method; empty: none are set

    bool hasAddress() const { return method == Method::Inform || method == Method::Manual; }
    friend bool operator==(const IPv4Configuration&, const IPv4Configuration&) = default;
};

// Whether a machine or a router can have an address on a network of this prefix: it is none of a network
// ("0.x.x.x", and the first of the prefix), loopback, multicast or reserved, nor the broadcast address (the
// last of the prefix). A prefix of 31 or 32 bits has no first and last ones. Any thread.
bool isHostAddress(IPv4Address address, int prefixLength);

// Whether two addresses lie on one network. Any thread.
bool areOnOneNetwork(IPv4Address one, IPv4Address other, int prefixLength);

// A configuration, or why there is none.
struct IPv4Reading {
    std::int32_t status = 0; // 0 or a NetworkConfigStatus
    std::string detail;      // what of the configuration that is about, for people; empty: as a whole
    IPv4Configuration configuration;

    explicit operator bool() const { return status == 0; }
};

// Reads a service's two protocols, of the IPv4 one the keys that the method has:
//  "Manual"     the first address with the first mask, and the router unless it is missing or empty
//  "INFORM"     the first address. The method brings no mask and no router of its own, but what an earlier
//               "Manual" left in the dictionary still counts: a mask that is none, or none at all, leaves the
//               prefix of the address's class (8 bits below 128.0.0.0, 16 below 192.0.0.0, 24 below
//               224.0.0.0); a router that is none, or not on that network, leaves none
//  "DHCP"       the client ID where there is one
//  "BOOTP"      nothing
//  "LinkLocal"  nothing
//  no method    nothing, nor with no dictionary at all
// Name servers may have blanks behind them. An address or a router must be one that a machine can have
// (isHostAddress), the router another one on the address's network.
//  ipv4, dns  the configurations, or none
// Any thread.
IPv4Reading readIPv4Configuration(const std::optional<PropertyList::Dictionary>& ipv4,
                                  const std::optional<PropertyList::Dictionary>& dns);

} // namespace welcomer::network
