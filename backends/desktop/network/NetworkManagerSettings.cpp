#include "backends/desktop/network/NetworkManagerSettings.h"

#include "backends/desktop/glib/Pointers.h"
#include "platform/NetworkConfigStore.h"
#include "propertylist/XMLPropertyListReader.h"

#include <algorithm>
#include <arpa/inet.h>
#include <array>
#include <bit>
#include <string_view>

namespace welcomer::desktop {

namespace {

using Dictionary = PropertyList::Dictionary;
using Array = PropertyList::Array;
using platform::kNetworkConfigInvalid;
using platform::kNetworkConfigSuccess;

constexpr unsigned kAddressBits = 32;

// Texts as addresses

bool isIPv4(const std::string& text) {
    in_addr address = {};
    return ::inet_pton(AF_INET, text.c_str(), &address) == 1 && text.find('\0') == std::string::npos;
}

bool isIPv6(const std::string& text) {
    in6_addr address = {};
    return ::inet_pton(AF_INET6, text.c_str(), &address) == 1 && text.find('\0') == std::string::npos;
}

// The length of the prefix that a mask stands for; none for what is no mask.
std::optional<unsigned> prefixLength(const std::string& mask) {
    in_addr address = {};
    if (!isIPv4(mask) || ::inet_pton(AF_INET, mask.c_str(), &address) != 1) {
        return std::nullopt;
    }
    const std::uint32_t bits = ntohl(address.s_addr);
    const auto length = static_cast<unsigned>(std::countl_one(bits));
    const bool isMask = length > 0 && length == static_cast<unsigned>(std::popcount(bits));
    return isMask ? std::optional(length) : std::nullopt;
}

// Values of a configuration

const PropertyList* valueIn(const Dictionary& values, const char* key) {
    const auto found = values.find(key);
    return found == values.end() ? nullptr : &found->second;
}

const std::string* textIn(const Dictionary& values, const char* key) {
    const PropertyList* value = valueIn(values, key);
    return value ? value->string() : nullptr;
}

const Array& listIn(const Dictionary& values, const char* key) {
    static const Array kNone;
    const PropertyList* value = valueIn(values, key);
    return value && value->array() ? *value->array() : kNone;
}

std::string textOf(const PropertyList& value) {
    return value.string() ? *value.string() : std::string();
}

// The addresses with their masks.
//  masksAreOptional  whether an address without a mask stands for itself alone
std::int32_t planAddresses(const Dictionary& configuration, bool masksAreOptional, IPv4Plan& plan) {
    const Array& addresses = listIn(configuration, platform::kNetworkAddresses);
    const Array& masks = listIn(configuration, platform::kNetworkSubnetMasks);
    for (std::size_t index = 0; index < addresses.size(); ++index) {
        const std::string address = textOf(addresses[index]);
        const bool hasMask = index < masks.size();
        const auto length = hasMask            ? prefixLength(textOf(masks[index]))
                            : masksAreOptional ? std::optional(kAddressBits)
                                               : std::nullopt;
        if (!isIPv4(address) || address == "0.0.0.0" || !length) {
            return kNetworkConfigInvalid;
        }
        plan.addresses.emplace_back(address, *length);
    }
    return addresses.empty() ? kNetworkConfigInvalid : kNetworkConfigSuccess;
}

std::int32_t planManual(const Dictionary& configuration, IPv4Plan& plan) {
    plan.method = IPv4Plan::Method::Manual;
    const PropertyList* router = valueIn(configuration, platform::kNetworkRouter);
    if (router && (!router->string() || !router->string()->empty())) {
        plan.router = textOf(*router);
        if (!isIPv4(plan.router) || plan.router == "0.0.0.0") {
            return kNetworkConfigInvalid;
        }
    }
    return planAddresses(configuration, false, plan);
}

// Settings of a profile

VariantPointer valueOf(GVariant* settings, const char* setting, const char* name, const GVariantType* type) {
    const VariantPointer group(g_variant_lookup_value(settings, setting, G_VARIANT_TYPE_VARDICT));
    return VariantPointer(group ? g_variant_lookup_value(group.get(), name, type) : nullptr);
}

std::string textOf(GVariant* settings, const char* setting, const char* name) {
    const VariantPointer value = valueOf(settings, setting, name, G_VARIANT_TYPE_STRING);
    return value ? g_variant_get_string(value.get(), nullptr) : "";
}

IPv4Plan::Method methodOf(const std::string& method) {
    if (method == "manual") {
        return IPv4Plan::Method::Manual;
    }
    if (method == "auto" || method.empty()) {
        return IPv4Plan::Method::Automatic;
    }
    return method == "link-local" ? IPv4Plan::Method::LinkLocal : IPv4Plan::Method::Other;
}

// What of a profile's IPv4 setting a configuration could have asked for.
IPv4Plan ipv4PlanOf(GVariant* settings) {
    IPv4Plan plan;
    plan.method = methodOf(textOf(settings, "ipv4", "method"));
    plan.router = textOf(settings, "ipv4", "gateway");
    plan.clientID = textOf(settings, "ipv4", "dhcp-client-id");
    const VariantPointer list = valueOf(settings, "ipv4", "address-data", G_VARIANT_TYPE("aa{sv}"));
    for (gsize index = 0; list && index < g_variant_n_children(list.get()); ++index) {
        const VariantPointer each(g_variant_get_child_value(list.get(), index));
        const char* address = "";
        guint32 prefix = 0;
        g_variant_lookup(each.get(), "address", "&s", &address);
        g_variant_lookup(each.get(), "prefix", "u", &prefix);
        plan.addresses.emplace_back(address, prefix);
    }
    return plan;
}

// The servers of one family. They may carry names for the encryption, behind a number sign.
std::vector<std::string> serversOf(GVariant* settings, const char* setting) {
    std::vector<std::string> servers;
    const VariantPointer list = valueOf(settings, setting, "dns-data", G_VARIANT_TYPE_STRING_ARRAY);
    for (gsize index = 0; list && index < g_variant_n_children(list.get()); ++index) {
        const char* server = "";
        g_variant_get_child(list.get(), index, "&s", &server);
        const std::string_view text = server;
        servers.emplace_back(text.substr(0, text.find('#')));
    }
    return servers;
}

DNSPlan dnsPlanOf(GVariant* settings) {
    return {serversOf(settings, "ipv4"), serversOf(settings, "ipv6")};
}

// The configuration that a plan comes from.
Dictionary configurationOf(const IPv4Plan& plan) {
    using Method = IPv4Plan::Method;
    Dictionary configuration;
    Array addresses;
    Array masks;
    for (const auto& [address, length] : plan.addresses) {
        addresses.emplace_back(address);
        masks.emplace_back(maskText(length));
    }
    const bool isInform = plan.method == Method::Automatic && !addresses.empty();
    if (plan.method == Method::Manual) {
        configuration.emplace(platform::kNetworkConfigMethod, platform::kNetworkMethodManual);
        if (!plan.router.empty()) {
            configuration.emplace(platform::kNetworkRouter, plan.router);
        }
    } else if (plan.method == Method::Automatic) {
        configuration.emplace(platform::kNetworkConfigMethod,
                              isInform ? platform::kNetworkMethodInform : platform::kNetworkMethodDHCP);
        if (!plan.clientID.empty()) {
            configuration.emplace(platform::kNetworkDHCPClientID, plan.clientID);
        }
    } else if (plan.method == Method::LinkLocal) {
        configuration.emplace(platform::kNetworkConfigMethod, platform::kNetworkMethodLinkLocal);
    }
    if (plan.method == Method::Manual || isInform) {
        configuration.emplace(platform::kNetworkAddresses, std::move(addresses));
        configuration.emplace(platform::kNetworkSubnetMasks, std::move(masks));
    }
    return configuration;
}

Array serverList(const DNSPlan& plan) {
    Array servers(plan.ipv4Servers.begin(), plan.ipv4Servers.end());
    servers.insert(servers.end(), plan.ipv6Servers.begin(), plan.ipv6Servers.end());
    return servers;
}

std::optional<Dictionary> configurationOf(const DNSPlan& plan) {
    if (plan.isEmpty()) {
        return std::nullopt;
    }
    return Dictionary{{platform::kNetworkServerAddresses, serverList(plan)}};
}

// The user data

// The pieces put together again, in the order of their names.
std::string keptText(GVariant* settings) {
    const VariantPointer data = valueOf(settings, "user", "data", G_VARIANT_TYPE("a{ss}"));
    std::map<std::string, std::string> pieces;
    for (gsize index = 0; data && index < g_variant_n_children(data.get()); ++index) {
        const char* name = nullptr;
        const char* piece = nullptr;
        g_variant_get_child(data.get(), index, "{&s&s}", &name, &piece);
        if (std::string_view(name).starts_with(kPiecePrefix)) {
            pieces.emplace(name, piece);
        }
    }
    std::string text;
    for (const auto& [name, piece] : pieces) {
        text += piece;
    }
    return text;
}

std::optional<Protocols> keptProtocols(GVariant* settings) {
    const PropertyListReadResult read = readXMLPropertyList(keptText(settings));
    if (!read || !read.value->isDictionary()) {
        return std::nullopt;
    }
    Protocols protocols;
    for (const auto& [type, entry] : *read.value->dictionary()) {
        const PropertyList* configuration = entry.find("Configuration");
        protocols.emplace(type, configuration && configuration->isDictionary()
                                    ? std::optional(*configuration->dictionary())
                                    : std::nullopt);
    }
    return protocols;
}

} // namespace

std::string maskText(unsigned prefixLength) {
    const std::uint32_t bits =
        prefixLength == 0 ? 0 : ~std::uint32_t{0} << (kAddressBits - std::min(prefixLength, kAddressBits));
    const in_addr address = {htonl(bits)};
    std::array<char, INET_ADDRSTRLEN> text = {};
    ::inet_ntop(AF_INET, &address, text.data(), text.size());
    return text.data();
}

std::int32_t planIPv4(const Dictionary& configuration, IPv4Plan& plan) {
    const PropertyList* method = valueIn(configuration, platform::kNetworkConfigMethod);
    IPv4Plan read;
    std::int32_t status = kNetworkConfigSuccess;
    const std::string name = method ? textOf(*method) : "";
    if (!method) {
        read.method = IPv4Plan::Method::None;
    } else if (name == platform::kNetworkMethodManual) {
        status = planManual(configuration, read);
    } else if (name == platform::kNetworkMethodInform) {
        read.method = IPv4Plan::Method::Automatic;
        status = planAddresses(configuration, true, read);
    } else if (name == platform::kNetworkMethodDHCP) {
        read.method = IPv4Plan::Method::Automatic;
        const std::string* clientID = textIn(configuration, platform::kNetworkDHCPClientID);
        read.clientID = clientID ? *clientID : "";
    } else if (name == platform::kNetworkMethodBootP) {
        read.method = IPv4Plan::Method::Automatic;
    } else if (name == platform::kNetworkMethodLinkLocal) {
        read.method = IPv4Plan::Method::LinkLocal;
    } else {
        status = platform::kNetworkConfigUnknownMethod;
    }
    if (status == kNetworkConfigSuccess) {
        plan = std::move(read);
    }
    return status;
}

std::int32_t planDNS(const Dictionary& configuration, DNSPlan& plan) {
    DNSPlan read;
    for (const PropertyList& each : listIn(configuration, platform::kNetworkServerAddresses)) {
        std::string server = textOf(each);
        server.erase(server.find_last_not_of(' ') + 1);
        if (isIPv4(server)) {
            read.ipv4Servers.push_back(std::move(server));
        } else if (isIPv6(server)) {
            read.ipv6Servers.push_back(std::move(server));
        } else {
            return kNetworkConfigInvalid;
        }
    }
    plan = std::move(read);
    return kNetworkConfigSuccess;
}

std::int32_t planAll(const Protocols& protocols, IPv4Plan& ipv4Plan, DNSPlan& dnsPlan) {
    const auto ipv4 = protocols.find(platform::kNetworkProtocolIPv4);
    const auto dns = protocols.find(platform::kNetworkProtocolDNS);
    std::int32_t status = kNetworkConfigSuccess;
    if (ipv4 != protocols.end() && ipv4->second) {
        status = planIPv4(*ipv4->second, ipv4Plan);
    }
    if (status == kNetworkConfigSuccess && dns != protocols.end() && dns->second) {
        status = planDNS(*dns->second, dnsPlan);
    }
    return status;
}

Protocols readProtocols(GVariant* settings) {
    const IPv4Plan ipv4Now = ipv4PlanOf(settings);
    const DNSPlan dnsNow = dnsPlanOf(settings);
    std::optional<Protocols> kept = keptProtocols(settings);
    if (!kept) {
        return {{platform::kNetworkProtocolIPv4, configurationOf(ipv4Now)},
                {platform::kNetworkProtocolDNS, configurationOf(dnsNow)}};
    }
    IPv4Plan ipv4Plan;
    DNSPlan dnsPlan;
    if (planAll(*kept, ipv4Plan, dnsPlan) != kNetworkConfigSuccess) {
        return *std::move(kept); // it never reached the profile's settings
    }
    if (ipv4Plan.method != IPv4Plan::Method::None && ipv4Plan != ipv4Now) {
        (*kept)[platform::kNetworkProtocolIPv4] = configurationOf(ipv4Now);
    }
    const bool hasServers = ipv4Now.method != IPv4Plan::Method::LinkLocal; // or has had to lose them
    if (const auto dns = kept->find(platform::kNetworkProtocolDNS); dns != kept->end() && hasServers) {
        if (!dns->second) {
            dns->second = configurationOf(dnsNow);
        } else if (!dnsPlan.isEmpty() && dnsPlan != dnsNow) {
            dns->second->erase(platform::kNetworkServerAddresses);
            if (!dnsNow.isEmpty()) {
                dns->second->emplace(platform::kNetworkServerAddresses, serverList(dnsNow));
            }
        }
    }
    return *std::move(kept);
}

} // namespace welcomer::desktop
