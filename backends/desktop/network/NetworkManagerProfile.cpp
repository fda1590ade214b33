#include "backends/desktop/network/NetworkManagerProfile.h"

#include "platform/NetworkConfigStore.h"
#include "propertylist/PropertyListWriter.h"

#include <algorithm>
#include <string_view>
#include <vector>

namespace welcomer::desktop {

namespace {

using Dictionary = PropertyList::Dictionary;
using network::IPv4Configuration;
using Method = IPv4Configuration::Method;
using platform::kNetworkConfigSuccess;

constexpr std::size_t kPieceSize = 8192; // the most that one value of the user data holds
constexpr std::size_t kMostPieces = 250; // of the 256 values that a profile holds
constexpr std::size_t kDigits = 3;

template <class Setting>
Setting* settingOf(NMConnection* profile, GType type, NMSetting* (*make)()) {
    NMSetting* setting = nm_connection_get_setting(profile, type);
    if (!setting) {
        setting = make();
        nm_connection_add_setting(profile, setting); // which takes it over
    }
    return reinterpret_cast<Setting*>(setting);
}

NMSettingIPConfig* ipv4SettingOf(NMConnection* profile) {
    return settingOf<NMSettingIPConfig>(profile, NM_TYPE_SETTING_IP4_CONFIG, nm_setting_ip4_config_new);
}
NMSettingIPConfig* ipv6SettingOf(NMConnection* profile) {
    return settingOf<NMSettingIPConfig>(profile, NM_TYPE_SETTING_IP6_CONFIG, nm_setting_ip6_config_new);
}
NMSettingUser* userSettingOf(NMConnection* profile) {
    return settingOf<NMSettingUser>(profile, NM_TYPE_SETTING_USER, nm_setting_user_new);
}

const char* methodName(Method method) {
    switch (method) {
    case Method::Manual:
        return NM_SETTING_IP4_CONFIG_METHOD_MANUAL;
    case Method::LinkLocal:
        return NM_SETTING_IP4_CONFIG_METHOD_LINK_LOCAL;
    default:
        return NM_SETTING_IP4_CONFIG_METHOD_AUTO;
    }
}

std::string orEmpty(const char* text) {
    return text ? text : "";
}

// The user data

std::vector<std::string> pieceNames(NMSettingUser* setting) {
    guint count = 0;
    const char* const* const keys = nm_setting_user_get_keys(setting, &count);
    std::vector<std::string> names;
    for (guint index = 0; index < count; ++index) {
        if (std::string_view(keys[index]).starts_with(kPiecePrefix)) {
            names.emplace_back(keys[index]);
        }
    }
    std::ranges::sort(names);
    return names;
}

// Where to cut a text so that no character is cut in two.
std::size_t cutBefore(std::string_view text, std::size_t position) {
    if (position >= text.size()) {
        return text.size();
    }
    constexpr unsigned char kMask = 0xC0;
    constexpr unsigned char kContinued = 0x80;
    while ((static_cast<unsigned char>(text[position]) & kMask) == kContinued) {
        --position;
    }
    return position;
}

std::int32_t keepProtocols(NMConnection* profile, const network::Protocols& protocols) {
    Dictionary content;
    for (const auto& [type, configuration] : protocols) {
        content[type] = configuration ? Dictionary{{"Configuration", *configuration}} : Dictionary();
    }
    const auto written = writeXMLPropertyList(content);
    if (!written) {
        return platform::kNetworkConfigWriteFailed;
    }
    NMSettingUser* const setting = userSettingOf(profile);
    for (const std::string& name : pieceNames(setting)) {
        nm_setting_user_set_data(setting, name.c_str(), nullptr, nullptr);
    }
    std::string_view rest = *written;
    for (std::size_t number = 0; !rest.empty(); ++number) {
        const std::size_t size = cutBefore(rest, kPieceSize);
        std::string digits = std::to_string(number);
        digits.insert(0, kDigits - std::min(kDigits, digits.size()), '0');
        const std::string name = std::string(kPiecePrefix) + digits;
        if (number == kMostPieces ||
            nm_setting_user_set_data(setting, name.c_str(), std::string(rest.substr(0, size)).c_str(),
                                     nullptr) == FALSE) {
            return platform::kNetworkConfigWriteFailed;
        }
        rest.remove_prefix(size);
    }
    return kNetworkConfigSuccess;
}

// Settings brought in line

void writeIPv6For(NMConnection* profile, bool isInform) {
    NMSettingUser* const user = userSettingOf(profile);
    NMSettingIPConfig* const setting = ipv6SettingOf(profile);
    const std::string before = orEmpty(nm_setting_user_get_data(user, kIPv6Before));
    const std::string now = orEmpty(nm_setting_ip_config_get_method(setting));
    if (isInform && now != NM_SETTING_IP6_CONFIG_METHOD_LINK_LOCAL) {
        nm_setting_user_set_data(user, kIPv6Before,
                                 now.empty() ? NM_SETTING_IP6_CONFIG_METHOD_AUTO : now.c_str(), nullptr);
        g_object_set(setting, NM_SETTING_IP_CONFIG_METHOD, NM_SETTING_IP6_CONFIG_METHOD_LINK_LOCAL,
                     NM_SETTING_IP_CONFIG_MAY_FAIL, TRUE, nullptr);
    } else if (!isInform && !before.empty()) {
        if (now == NM_SETTING_IP6_CONFIG_METHOD_LINK_LOCAL) {
            g_object_set(setting, NM_SETTING_IP_CONFIG_METHOD, before.c_str(), nullptr);
        }
        nm_setting_user_set_data(user, kIPv6Before, nullptr, nullptr);
    }
}

void writeIPv4(NMConnection* profile, const IPv4Configuration& configuration) {
    if (configuration.method == Method::Unset) {
        return;
    }
    NMSettingIPConfig* const setting = ipv4SettingOf(profile);
    nm_setting_ip_config_clear_addresses(setting);
    if (configuration.hasAddress()) {
        NMIPAddress* const address =
            nm_ip_address_new(AF_INET, network::formatIPv4(configuration.address).c_str(),
                              static_cast<guint>(configuration.prefixLength.value_or(0)), nullptr);
        nm_setting_ip_config_add_address(setting, address);
        nm_ip_address_unref(address);
    }
    const std::string router = configuration.router ? network::formatIPv4(*configuration.router) : "";
    const std::string& clientID = configuration.clientID;
    g_object_set(setting, NM_SETTING_IP_CONFIG_METHOD, methodName(configuration.method),
                 NM_SETTING_IP_CONFIG_GATEWAY, router.empty() ? nullptr : router.c_str(),
                 NM_SETTING_IP4_CONFIG_DHCP_CLIENT_ID, clientID.empty() ? nullptr : clientID.c_str(),
                 nullptr);
    const bool isInform = configuration.method == Method::Inform;
    if (isInform) {
        g_object_set(setting, NM_SETTING_IP_CONFIG_MAY_FAIL, TRUE, nullptr);
    }
    writeIPv6For(profile, isInform);
}

// The servers of one family take the place of the network's own.
void writeServers(NMSettingIPConfig* setting, const std::vector<std::string>& servers, bool areIPv6) {
    nm_setting_ip_config_clear_dns(setting);
    for (const std::string& server : servers) {
        if ((server.find(':') != std::string::npos) == areIPv6) {
            nm_setting_ip_config_add_dns(setting, server.c_str());
        }
    }
    g_object_set(setting, NM_SETTING_IP_CONFIG_IGNORE_AUTO_DNS, TRUE, nullptr);
}

} // namespace

std::int32_t writeProtocols(NMConnection* profile, const network::StoredService& service,
                            const IPv4Configuration& configuration) {
    const std::vector<std::string>& servers = configuration.servers;
    if (std::ranges::any_of(servers, [](const auto& each) { return each.find('%') != std::string::npos; })) {
        return platform::kNetworkConfigInvalid; // a profile's servers have no zone
    }
    if (service.changedTypes.contains(platform::kNetworkProtocolIPv4)) {
        writeIPv4(profile, configuration);
    }
    if (!servers.empty()) {
        writeServers(ipv4SettingOf(profile), servers, false);
        writeServers(ipv6SettingOf(profile), servers, true);
    }
    NMSettingIPConfig* const setting = ipv4SettingOf(profile);
    if (orEmpty(nm_setting_ip_config_get_method(setting)) == NM_SETTING_IP4_CONFIG_METHOD_LINK_LOCAL) {
        nm_setting_ip_config_clear_dns(setting); // which a profile for the link alone must not have
        nm_setting_ip_config_clear_dns_searches(setting);
    }
    return keepProtocols(profile, service.protocols);
}

NMConnection* newWiredProfile(const std::string& device, const std::string& name, const std::string& uuid) {
    NMConnection* const profile = nm_simple_connection_new();
    NMSetting* const connection = nm_setting_connection_new();
    g_object_set(connection, NM_SETTING_CONNECTION_ID, name.c_str(), NM_SETTING_CONNECTION_UUID, uuid.c_str(),
                 NM_SETTING_CONNECTION_TYPE, NM_SETTING_WIRED_SETTING_NAME,
                 NM_SETTING_CONNECTION_INTERFACE_NAME, device.c_str(), NM_SETTING_CONNECTION_AUTOCONNECT,
                 TRUE, nullptr);
    nm_connection_add_setting(profile, connection);
    nm_connection_add_setting(profile, nm_setting_wired_new());
    g_object_set(ipv4SettingOf(profile), NM_SETTING_IP_CONFIG_METHOD, NM_SETTING_IP4_CONFIG_METHOD_AUTO,
                 nullptr);
    g_object_set(ipv6SettingOf(profile), NM_SETTING_IP_CONFIG_METHOD, NM_SETTING_IP6_CONFIG_METHOD_AUTO,
                 nullptr);
    return profile;
}

} // namespace welcomer::desktop
