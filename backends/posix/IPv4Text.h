// IPv4 addresses and masks as text.

#pragma once

#include "backends/posix/NetlinkMessages.h"

#include <optional>
#include <string>

namespace welcomer::posix {

// Four decimal numbers with dots between them; none for everything else. Any thread.
std::optional<IPv4Address> parseIPv4(const std::string& text);
std::string formatIPv4(IPv4Address address);

// Between a mask and the number of its leading one bits; none for a mask with a zero bit before a one bit.
std::optional<int> prefixLengthOf(IPv4Address mask);
IPv4Address maskOf(int prefixLength);

// Whether a text is an IPv4 address or an IPv6 address, with a zone where it has one.
bool isAddress(const std::string& text);

} // namespace welcomer::posix
