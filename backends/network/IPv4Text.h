// Addresses and masks as text.

#pragma once

#include <cstdint>
#include <optional>
#include <string>

namespace welcomer::network {

// An IPv4 address in the host's byte order.
using IPv4Address = std::uint32_t;

// Four decimal numbers with dots between them; none for everything else. Any thread, as all of this.
std::optional<IPv4Address> parseIPv4(const std::string& text);
std::string formatIPv4(IPv4Address address);

// Between a mask and the number of its leading one bits; none for a mask with a zero bit before a one bit.
std::optional<int> prefixLengthOf(IPv4Address mask);
IPv4Address maskOf(int prefixLength);

// Whether a text is an IPv4 address or an IPv6 address, with a zone where it has one.
bool isAddress(const std::string& text);

} // namespace welcomer::network
