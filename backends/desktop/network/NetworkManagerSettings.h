// What a connection profile's settings say, as NetworkManager tells them.

#pragma once

#include "backends/network/StoredConfiguration.h"

#include <gio/gio.h>

#include <string>

namespace welcomer::desktop {

// The protocols that are kept in a profile's user data, as they were written. A profile that keeps none, and
// the parts of one that make no sense or were changed by others since, are read as its settings have them.
//  settings  the profile as NetworkManager gives it, of type a{sa{sv}}; borrowed
// Any thread.
network::Protocols readProtocols(GVariant* settings);

// The names in a profile's user data: what the numbered pieces of the protocols begin with, and the method
// that IPv6 had before it was changed along.
inline constexpr char kPiecePrefix[] = "com.corvid.welcomer.protocols.";
inline constexpr char kIPv6Before[] = "com.corvid.welcomer.ipv6-before";

// The addresses of a list as NetworkManager gives it, and the mask of each, as texts.
struct AddressTexts {
    PropertyList::Array addresses;
    PropertyList::Array masks;
};

//  list  of type aa{sv}, borrowed; null is an empty one
AddressTexts readAddresses(GVariant* list);

} // namespace welcomer::desktop
