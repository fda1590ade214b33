// What a connection profile's settings say, as NetworkManager tells them, and what a service's configurations
// ask of them.

#pragma once

#include "propertylist/PropertyList.h"

#include <gio/gio.h>

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <utility>
#include <vector>

namespace welcomer::desktop {

// A service's protocols: from type to the configuration, or none.
using Protocols = std::map<std::string, std::optional<PropertyList::Dictionary>>;

// What of an IPv4 configuration takes effect.
struct IPv4Plan {
    enum class Method { None, Manual, Automatic, LinkLocal, Other };
    Method method = Method::None; // none: the profile stays as it is; other: one that has no name here
    std::vector<std::pair<std::string, unsigned>> addresses; // each with the length of its prefix
    std::string router;                                      // empty: none
    std::string clientID;                                    // empty: none
    friend bool operator==(const IPv4Plan&, const IPv4Plan&) = default;
};

// What of a DNS configuration takes effect.
struct DNSPlan {
    std::vector<std::string> ipv4Servers;
    std::vector<std::string> ipv6Servers;
    friend bool operator==(const DNSPlan&, const DNSPlan&) = default;
    bool isEmpty() const { return ipv4Servers.empty() && ipv6Servers.empty(); }
};

// Reads configurations, the keys of the current method alone:
//  "Manual"          the addresses with their masks, and the router unless it is missing or empty
//  "INFORM"          automatic, with the addresses added; one without a mask stands for itself alone
//  "DHCP"            automatic, with the client ID where there is one
//  "BOOTP"           automatic
//  "LinkLocal"       an address that the machine picks for this link alone
//  no method         nothing
// Name servers may have blanks behind them.
//  plan    receives what takes effect; unchanged on failure
//  result  0 or a NetworkConfigStatus
// Any thread, as all of this.
std::int32_t planIPv4(const PropertyList::Dictionary& configuration, IPv4Plan& plan);
std::int32_t planDNS(const PropertyList::Dictionary& configuration, DNSPlan& plan);

// Both of a service's protocols.
//  result  0, or the status of the first that makes no sense
std::int32_t planAll(const Protocols& protocols, IPv4Plan& ipv4Plan, DNSPlan& dnsPlan);

// The protocols that are kept in a profile's user data, as they were written. A profile that keeps none, and
// the parts of one that were changed by others since, are read as its settings have them.
//  settings  the profile as NetworkManager gives it, of type a{sa{sv}}; borrowed
Protocols readProtocols(GVariant* settings);

// The names in a profile's user data: what the numbered pieces of the protocols begin with, and the method
// that IPv6 had before it was changed along.
inline constexpr char kPiecePrefix[] = "com.corvid.welcomer.protocols.";
inline constexpr char kIPv6Before[] = "com.corvid.welcomer.ipv6-before";

// The mask of a prefix of this length as text.
std::string maskText(unsigned prefixLength);

} // namespace welcomer::desktop
