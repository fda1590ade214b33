// welcomer network: what the network is configured to, whether it works, and configuring it.

#include "network/NetworkingManager.h"
#include "network/WLPortScanner.h"
#include "platform/Platform.h"
#include "tools/welcomer/cli/Tool.h"
#include "tools/welcomer/commands/Commands.h"
#include "tools/welcomer/terminal/WaitingLine.h"

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace welcomer::tool {

namespace {

using Text = NetworkingManager::Text;
using TextList = NetworkingManager::TextList;

constexpr std::uint64_t kDefaultWarningType = 1;
constexpr std::int64_t kDefaultWait = 10;

// What `network apply` was given.
struct Settings {
    std::string choice;
    Text method;
    Text address;
    Text subnetMask;
    Text router;
    std::vector<std::string> dns;
    Text dhcpClientID;
    std::uint64_t warningType = kDefaultWarningType;
    std::int64_t wait = kDefaultWait;
};

Json asJson(const Text& text) {
    return text ? Json(*text) : Json();
}

Json asJson(const TextList& list) {
    return list ? Json(*list) : Json();
}

std::string entry(const PropertyList::Dictionary& values, const char* key) {
    const auto found = values.find(key);
    return found == values.end() || !found->second.string() ? "" : *found->second.string();
}

Report show(Session& /*session*/) {
    const NetworkingManager manager;
    Report report;
    report.document = {{"method", asJson(manager.defaultConfigurationMethod())},
                       {"address", asJson(manager.defaultIPAddress())},
                       {"subnetMask", asJson(manager.defaultSubnetMask())},
                       {"router", asJson(manager.defaultRouter())},
                       {"dns", asJson(manager.defaultDNS())},
                       {"searchDomains", asJson(manager.defaultSearchDomains())}};
    return report.fields({{"Method:", "method"},
                          {"Address:", "address"},
                          {"Subnet mask:", "subnetMask"},
                          {"Router:", "router"},
                          {"DNS servers:", "dns"},
                          {"Search domains:", "searchDomains"}});
}

Report listPorts(Session& /*session*/) {
    Json ports = Json::array();
    for (const PropertyList::Dictionary& port : machinePortList()) {
        ports.push_back({{"device", entry(port, WLMachinePortUID)},
                         {"kind", entry(port, WLMachinePortConnectionType)},
                         {"name", entry(port, WLMachinePortName)}});
    }
    Report report;
    report.document = {{"ports", ports}};
    if (ports.empty()) {
        return report.line("This machine has no network ports.");
    }
    return report.table(ports, {{"DEVICE", "device"}, {"KIND", "kind"}, {"NAME", "name"}});
}

Report probe(Session& /*session*/) {
    const WaitingLine waiting("Asking the network", true);
    NetworkingManager manager;
    Report report;
    report.document = {
        {"internetIsReachable", NetworkingManager::internetIsReachable()},
        {"isEthernetCablePluggedIn", manager.isEthernetCablePluggedIn()},
        {"hasUsableDynamicEthernetConfiguration", manager.hasUsableDynamicEthernetConfiguration()},
        {"dirServiceNodesExist", manager.dirServiceNodesExist()},
        {"isOnCorvidInternalNetwork", NetworkingManager::isOnCorvidInternalNetwork()}};
    return report.fields({{"The internet is reachable:", "internetIsReachable"},
                          {"An Ethernet cable is in:", "isEthernetCablePluggedIn"},
                          {"Dynamic configuration usable:", "hasUsableDynamicEthernetConfiguration"},
                          {"Network directories reachable:", "dirServiceNodesExist"},
                          {"On the maker's own network:", "isOnCorvidInternalNetwork"}});
}

void checkSettings(const Settings& settings) {
    if (settings.wait < 0) {
        throw UsageError("--wait: a wait cannot be negative");
    }
    if (settings.method == kConfigurationMethodManual && (!settings.address || !settings.subnetMask)) {
        throw UsageError("--method Manual needs --ip and --subnet");
    }
    if (settings.method == kConfigurationMethodManualDHCP && !settings.address) {
        throw UsageError("--method \"Manual DHCP\" needs --ip");
    }
}

// Whether the choice and the warning type leave nothing to configure and nothing to check.
bool leaveNothingToDo(const Settings& settings) {
    constexpr std::uint64_t lastCheckingType = 2;
    return settings.warningType == 0 ||
           (settings.warningType > lastCheckingType && settings.choice != kUserChoiceLAN);
}

Report apply(Session& session, const Settings& settings) {
    checkSettings(settings);
    {
        const WaitingLine waiting("Applying, and waiting for the network for at most " +
                                      std::to_string(settings.wait) + " s",
                                  true);
        NetworkingManager manager;
        manager.setUserChoice(settings.choice);
        manager.setConfigurationMethod(settings.method);
        manager.setIpAddress(settings.address);
        manager.setSubnetMask(settings.subnetMask);
        manager.setRouter(settings.router.value_or("")); // an empty field: no router
        if (!settings.dns.empty()) {
            manager.setDns(settings.dns);
        }
        manager.setDhcpClientID(settings.dhcpClientID);
        manager.setInternetConnectionWarningType(settings.warningType);
        manager.setSecondsToWaitForInternetReachability(settings.wait);
        PropertyList::Dictionary error;
        if (!manager.applySettings(&error)) {
            throw CommandFailure(entry(error, "title") + ". " + entry(error, "body") +
                                 (manager.wasRefusedByStore() ? " (" + session.log.reason() + ")" : ""));
        }
    }
    const bool applied = !leaveNothingToDo(settings);
    return Report({{"applied", applied}},
                  applied ? "Done." : "Nothing was to be done: nothing is configured, and nothing checked.");
}

Report registerServices(Session& session) {
    std::vector<std::string> names;
    {
        const WaitingLine waiting("Waiting for the network configuration", true);
        NetworkingManager manager;
        manager.registerNewNetworkServices();
        if (manager.wasRefusedByStore()) {
            throw CommandFailure(session.log.reason());
        }
        const auto set = manager.systemPreferences()->copyCurrentSet();
        const auto services = set ? set->copyServices() : std::nullopt;
        if (!services) {
            throw CommandFailure("there is no network configuration: " + session.log.reason());
        }
        for (const auto& service : *services) {
            names.push_back(service->name().value_or("-"));
        }
    }
    Report report({{"services", names}}, "The network services are stored:");
    for (const std::string& name : names) {
        report.line("  " + name);
    }
    return report;
}

void addApplyCommand(CommandLine& commandLine, CommandLevel group) {
    const auto settings = std::make_shared<Settings>();
    CommandLevel command =
        commandLine.addCommand(group, "apply",
                               "Configure the network of this machine, also with --root, as "
                               "the user chooses, and check that it works",
                               [=](Session& session) { return apply(session, *settings); });
    command.option("--choice", settings->choice, "lan, wifi or no; only lan configures anything")
        .required()
        .oneOf({kUserChoiceLAN, kUserChoiceWiFi, kUserChoiceNoInternet});
    command
        .option("--method", settings->method, "Manual, Manual DHCP, DHCP or BootP; DHCP when none is given")
        .oneOf({kConfigurationMethodManual, kConfigurationMethodManualDHCP, kConfigurationMethodDHCP,
                kConfigurationMethodBootP});
    command.option("--ip", settings->address, "The address").called("A");
    command.option("--subnet", settings->subnetMask, "The subnet mask, such as 255.255.255.0").called("M");
    command.option("--router", settings->router, "The router; none when it is left out").called("R");
    command.option("--dns", settings->dns, "A DNS server; may be given several times").called("A").repeated();
    command.option("--dhcp-client-id", settings->dhcpClientID, "The DHCP client ID").called("ID");
    command
        .option("--warning-type", settings->warningType,
                "0: configure and check nothing; 1: wait for the internet; 2: fail; others: check nothing")
        .called("N")
        .checked([](const std::string& text) {
            return std::string(text.starts_with('-') ? "a warning type cannot be negative" : "");
        })
        .showsDefault();
    command.option("--wait", settings->wait, "How long to wait for the internet")
        .called("SECONDS")
        .showsDefault();
}

} // namespace

void addNetworkCommands(CommandLine& commandLine) {
    CommandLevel group =
        commandLine.addGroup("network", "The network: what it is configured to, and whether it works");
    commandLine.addCommand(group, "show", "Show what the primary connection is configured to now", show);
    commandLine.addCommand(group, "ports", "List the network ports of this machine", listPorts);
    commandLine.addCommand(group, "probe", "Ask whether the network works", probe);
    addApplyCommand(commandLine, group);
    commandLine.addCommand(group, "register", "Store a service for every network port that has none",
                           registerServices);
}

} // namespace welcomer::tool
