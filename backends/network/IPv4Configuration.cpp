#include "backends/network/IPv4Configuration.h"

#include "platform/NetworkConfigStore.h"

#include <array>
#include <utility>

namespace welcomer::network {

namespace {

using Dictionary = PropertyList::Dictionary;
using Method = IPv4Configuration::Method;
using platform::kNetworkConfigInvalid;

constexpr int kAddressBits = 32;

const PropertyList* valueIn(const Dictionary& values, const char* key) {
    const auto found = values.find(key);
    return found == values.end() ? nullptr : &found->second;
}

std::string textOf(const PropertyList* value) {
    const std::string* const text = value ? value->string() : nullptr;
    return text ? *text : std::string();
}

// The first text of a list; empty when there is none.
std::string firstIn(const Dictionary& values, const char* key) {
    const PropertyList* const value = valueIn(values, key);
    const PropertyList::Array* const list = value ? value->array() : nullptr;
    return list && !list->empty() ? textOf(&list->front()) : std::string();
}

std::optional<int> prefixLengthIn(const std::string& mask) {
    const auto bits = parseIPv4(mask);
    const auto length = bits ? prefixLengthOf(*bits) : std::nullopt;
    return length && *length > 0 ? length : std::nullopt;
}

int prefixLengthOfClass(IPv4Address address) {
    constexpr IPv4Address kFirstOfB = 0x80000000;
    constexpr IPv4Address kFirstOfC = 0xC0000000;
    return address < kFirstOfB ? 8 : address < kFirstOfC ? 16 : 24;
}

bool isRouter(IPv4Address router, const IPv4Configuration& configuration) {
    const int prefixLength = configuration.prefixLength.value_or(0);
    return router != configuration.address && isHostAddress(router, prefixLength) &&
           areOnOneNetwork(router, configuration.address, prefixLength);
}

IPv4Reading refused(std::int32_t status, std::string detail) {
    return {status, std::move(detail), {}};
}

// The address with its network, into a configuration whose method is set.
IPv4Reading readAddress(const Dictionary& ipv4, IPv4Configuration configuration) {
    const bool isManual = configuration.method == Method::Manual;
    const std::string addressText = firstIn(ipv4, platform::kNetworkAddresses);
    const auto address = parseIPv4(addressText);
    if (!address) {
        return refused(kNetworkConfigInvalid, "address \"" + addressText + "\"");
    }
    const std::string mask = firstIn(ipv4, platform::kNetworkSubnetMasks);
    configuration.address = *address;
    configuration.prefixLength = prefixLengthIn(mask);
    if (!configuration.prefixLength) {
        if (isManual) {
            return refused(kNetworkConfigInvalid, "subnet mask \"" + mask + "\"");
        }
        configuration.prefixLength = prefixLengthOfClass(*address);
    }
    if (!isHostAddress(*address, *configuration.prefixLength)) {
        return refused(kNetworkConfigInvalid,
                       "address " + addressText + "/" + std::to_string(*configuration.prefixLength));
    }
    const PropertyList* const routerValue = valueIn(ipv4, platform::kNetworkRouter);
    const auto router = parseIPv4(textOf(routerValue));
    if (router && isRouter(*router, configuration)) {
        configuration.router = router;
    } else if (isManual && routerValue && *routerValue != PropertyList("")) {
        return refused(kNetworkConfigInvalid, "router \"" + textOf(routerValue) + "\"");
    }
    return {0, {}, std::move(configuration)};
}

IPv4Reading readMethod(const Dictionary& ipv4) {
    constexpr std::array<std::pair<const char*, Method>, 5> kMethods = {{
        {platform::kNetworkMethodDHCP, Method::DHCP},
        {platform::kNetworkMethodBootP, Method::BootP},
        {platform::kNetworkMethodInform, Method::Inform},
        {platform::kNetworkMethodManual, Method::Manual},
        {platform::kNetworkMethodLinkLocal, Method::LinkLocal},
    }};
    const PropertyList* const method = valueIn(ipv4, platform::kNetworkConfigMethod);
    if (!method) {
        return {};
    }
    IPv4Configuration configuration;
    for (const auto& [name, value] : kMethods) {
        if (textOf(method) == name) {
            configuration.method = value;
        }
    }
    if (configuration.method == Method::Unset) {
        return refused(platform::kNetworkConfigUnknownMethod, "\"" + textOf(method) + "\"");
    }
    if (configuration.hasAddress()) {
        return readAddress(ipv4, std::move(configuration));
    }
    if (configuration.method == Method::DHCP) {
        configuration.clientID = textOf(valueIn(ipv4, platform::kNetworkDHCPClientID));
    }
    return {0, {}, std::move(configuration)};
}

} // namespace

bool isHostAddress(IPv4Address address, int prefixLength) {
    constexpr unsigned kLoopback = 127;
    constexpr unsigned kFirstOfMulticast = 224;
    const unsigned first = address >> 24U;
    if (first == 0 || first == kLoopback || first >= kFirstOfMulticast) {
        return false;
    }
    const IPv4Address hostBits = ~maskOf(prefixLength);
    const IPv4Address host = address & hostBits;
    return prefixLength >= kAddressBits - 1 || (host != 0 && host != hostBits);
}

bool areOnOneNetwork(IPv4Address one, IPv4Address other, int prefixLength) {
    return ((one ^ other) & maskOf(prefixLength)) == 0;
}

IPv4Reading readIPv4Configuration(const std::optional<Dictionary>& ipv4,
                                  const std::optional<Dictionary>& dns) {
    IPv4Reading reading = ipv4 ? readMethod(*ipv4) : IPv4Reading();
    const PropertyList* const servers = dns ? valueIn(*dns, platform::kNetworkServerAddresses) : nullptr;
    if (!reading || !servers || !servers->array()) {
        return reading;
    }
    for (const PropertyList& each : *servers->array()) {
        std::string server = textOf(&each);
        server.erase(server.find_last_not_of(' ') + 1);
        if (!isAddress(server)) {
            return refused(kNetworkConfigInvalid, "name server \"" + server + "\"");
        }
        reading.configuration.servers.push_back(std::move(server));
    }
    return reading;
}

} // namespace welcomer::network
