#include "backends/network/IPv4Text.h"

#include <arpa/inet.h>
#include <array>
#include <bit>

namespace welcomer::network {

std::optional<IPv4Address> parseIPv4(const std::string& text) {
    in_addr address = {};
    if (text.find('\0') != std::string::npos || ::inet_pton(AF_INET, text.c_str(), &address) != 1) {
        return std::nullopt;
    }
    return ntohl(address.s_addr);
}

std::string formatIPv4(IPv4Address address) {
    std::array<char, INET_ADDRSTRLEN> text = {};
    const in_addr network{htonl(address)};
    ::inet_ntop(AF_INET, &network, text.data(), text.size());
    return text.data();
}

std::optional<int> prefixLengthOf(IPv4Address mask) {
    const int length = std::countl_one(mask);
    return mask == maskOf(length) ? std::optional(length) : std::nullopt;
}

IPv4Address maskOf(int prefixLength) {
    return prefixLength == 0 ? 0 : ~IPv4Address{0} << (32 - prefixLength);
}

bool isAddress(const std::string& text) {
    if (parseIPv4(text)) {
        return true;
    }
    const std::size_t zone = text.find('%');
    const bool hasGoodZone =
        zone == std::string::npos ||
        (zone + 1 < text.size() &&
         text.find_first_not_of("abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ0123456789._-",
                                zone + 1) == std::string::npos);
    in6_addr address = {};
    return hasGoodZone && text.find('\0') == std::string::npos &&
           ::inet_pton(AF_INET6, text.substr(0, zone).c_str(), &address) == 1;
}

} // namespace welcomer::network
