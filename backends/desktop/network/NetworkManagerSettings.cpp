#include "backends/desktop/network/NetworkManagerSettings.h"

#include "backends/desktop/glib/Pointers.h"
#include "propertylist/XMLPropertyListReader.h"

#include <algorithm>
#include <string_view>

namespace welcomer::desktop {

namespace {

using Dictionary = PropertyList::Dictionary;
using Array = PropertyList::Array;
using network::IPv4Configuration;
using network::readIPv4Configuration;
using Method = IPv4Configuration::Method;

constexpr char kMethodLinkLocal[] = "link-local";

VariantPointer valueOf(GVariant* settings, const char* setting, const char* name, const GVariantType* type) {
    const VariantPointer group(g_variant_lookup_value(settings, setting, G_VARIANT_TYPE_VARDICT));
    return VariantPointer(group ? g_variant_lookup_value(group.get(), name, type) : nullptr);
}

std::string textOf(GVariant* settings, const char* setting, const char* name) {
    const VariantPointer value = valueOf(settings, setting, name, G_VARIANT_TYPE_STRING);
    return value ? g_variant_get_string(value.get(), nullptr) : "";
}

// The mask of a prefix of this length.
std::string maskText(unsigned prefixLength) {
    constexpr unsigned kAddressBits = 32;
    return network::formatIPv4(network::maskOf(static_cast<int>(std::min(prefixLength, kAddressBits))));
}

// An IPv4 configuration in the one form that it has when it is read from a profile's setting.
Dictionary settingForm(Method method, Array addresses, Array masks, const std::string& router,
                       const std::string& clientID) {
    Dictionary form;
    if (method == Method::LinkLocal) {
        form.emplace(platform::kNetworkConfigMethod, platform::kNetworkMethodLinkLocal);
        return form;
    }
    const bool isManual = method == Method::Manual;
    const bool hasAddresses = isManual || method == Method::Inform;
    form.emplace(platform::kNetworkConfigMethod, isManual       ? platform::kNetworkMethodManual
                                                 : hasAddresses ? platform::kNetworkMethodInform
                                                                : platform::kNetworkMethodDHCP);
    if (hasAddresses) {
        form.emplace(platform::kNetworkAddresses, std::move(addresses));
        form.emplace(platform::kNetworkSubnetMasks, std::move(masks));
    }
    if (hasAddresses && !router.empty()) {
        form.emplace(platform::kNetworkRouter, router);
    }
    if (!isManual && !clientID.empty()) {
        form.emplace(platform::kNetworkDHCPClientID, clientID);
    }
    return form;
}

Dictionary settingForm(const IPv4Configuration& configuration) {
    return settingForm(configuration.method, {network::formatIPv4(configuration.address)},
                       {maskText(static_cast<unsigned>(configuration.prefixLength.value_or(0)))},
                       configuration.router ? network::formatIPv4(*configuration.router) : "",
                       configuration.clientID);
}

// What a profile's IPv4 setting says; empty for a method that has no name here.
Dictionary ipv4Of(GVariant* settings) {
    const VariantPointer list = valueOf(settings, "ipv4", "address-data", G_VARIANT_TYPE("aa{sv}"));
    AddressTexts texts = readAddresses(list.get());
    const std::string name = textOf(settings, "ipv4", "method");
    Method method = texts.addresses.empty() ? Method::DHCP : Method::Inform;
    if (name == "manual") {
        method = Method::Manual;
    } else if (name == kMethodLinkLocal) {
        method = Method::LinkLocal;
    } else if (name != "auto" && !name.empty()) {
        return {};
    }
    return settingForm(method, std::move(texts.addresses), std::move(texts.masks),
                       textOf(settings, "ipv4", "gateway"), textOf(settings, "ipv4", "dhcp-client-id"));
}

// The servers of one family. They may carry names for the encryption, behind a number sign.
void addServers(GVariant* settings, const char* setting, Array& servers) {
    const VariantPointer list = valueOf(settings, setting, "dns-data", G_VARIANT_TYPE_STRING_ARRAY);
    for (gsize index = 0; list && index < g_variant_n_children(list.get()); ++index) {
        const char* server = "";
        g_variant_get_child(list.get(), index, "&s", &server);
        const std::string_view text = server;
        servers.emplace_back(text.substr(0, text.find('#')));
    }
}

Array serversOf(GVariant* settings) {
    Array servers;
    addServers(settings, "ipv4", servers);
    addServers(settings, "ipv6", servers);
    return servers;
}

// Name servers in the order that they have when they are read from a profile's settings.
Array settingForm(std::vector<std::string> servers) {
    std::stable_partition(servers.begin(), servers.end(),
                          [](const std::string& each) { return each.find(':') == std::string::npos; });
    return {servers.begin(), servers.end()};
}

std::optional<Dictionary> dnsWith(const Array& servers) {
    return servers.empty() ? std::nullopt
                           : std::optional(Dictionary{{platform::kNetworkServerAddresses, servers}});
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

std::optional<network::Protocols> keptProtocols(GVariant* settings) {
    const PropertyListReadResult read = readXMLPropertyList(keptText(settings));
    if (!read || !read.value->isDictionary()) {
        return std::nullopt;
    }
    network::Protocols protocols;
    for (const auto& [type, entry] : *read.value->dictionary()) {
        const PropertyList* configuration = entry.find("Configuration");
        protocols.emplace(type, configuration && configuration->isDictionary()
                                    ? std::optional(*configuration->dictionary())
                                    : std::nullopt);
    }
    return protocols;
}

// Replaces what is kept of a protocol where the settings say something else by now.
void updateIPv4(std::optional<Dictionary>& kept, const Dictionary& now) {
    const auto reading = readIPv4Configuration(kept, std::nullopt);
    const bool isOther =
        reading.configuration.method != Method::Unset && settingForm(reading.configuration) != now;
    if (!reading || isOther) {
        kept = now;
    }
}

void updateDNS(std::optional<Dictionary>& kept, const Array& now) {
    const auto reading = readIPv4Configuration(std::nullopt, kept);
    const std::vector<std::string>& servers = reading.configuration.servers;
    if (!kept || !reading) {
        kept = dnsWith(now);
    } else if (!servers.empty() && settingForm(servers) != now) {
        kept->erase(platform::kNetworkServerAddresses);
        kept->merge(dnsWith(now).value_or(Dictionary()));
    }
}

} // namespace

network::Protocols readProtocols(GVariant* settings) {
    const Dictionary ipv4Now = ipv4Of(settings);
    const Array serversNow = serversOf(settings);
    std::optional<network::Protocols> kept = keptProtocols(settings);
    if (!kept) {
        return {{platform::kNetworkProtocolIPv4, ipv4Now},
                {platform::kNetworkProtocolDNS, dnsWith(serversNow)}};
    }
    if (const auto ipv4 = kept->find(platform::kNetworkProtocolIPv4); ipv4 != kept->end()) {
        updateIPv4(ipv4->second, ipv4Now);
    }
    const bool mayHaveServers = textOf(settings, "ipv4", "method") != kMethodLinkLocal; // it had to lose them
    if (const auto dns = kept->find(platform::kNetworkProtocolDNS); dns != kept->end() && mayHaveServers) {
        updateDNS(dns->second, serversNow);
    }
    return *std::move(kept);
}

AddressTexts readAddresses(GVariant* list) {
    AddressTexts texts;
    for (gsize index = 0; list && index < g_variant_n_children(list); ++index) {
        const VariantPointer each(g_variant_get_child_value(list, index));
        const char* address = "";
        guint32 prefixLength = 0;
        g_variant_lookup(each.get(), "address", "&s", &address);
        g_variant_lookup(each.get(), "prefix", "u", &prefixLength);
        texts.addresses.emplace_back(address);
        texts.masks.emplace_back(maskText(prefixLength));
    }
    return texts;
}

} // namespace welcomer::desktop
