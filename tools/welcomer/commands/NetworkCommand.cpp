// welcomer network: what the network is configured to, whether it works, and configuring it.

#include "network/NetworkingManager.h"
#include "network/WLPortScanner.h"
#include "platform/Platform.h"
#include "tools/welcomer/cli/PropertyListOutput.h"
#include "tools/welcomer/cli/Tool.h"
#include "tools/welcomer/commands/Commands.h"
#include "tools/welcomer/terminal/Printable.h"
#include "tools/welcomer/terminal/TextTable.h"
#include "tools/welcomer/terminal/WaitingLine.h"

#include <CLI/CLI.hpp>
#include <cstdint>
#include <memory>
#include <optional>
#include <ostream>
#include <string>
#include <vector>

namespace welcomer::tool {

namespace {

using Text = NetworkingManager::Text;
using TextList = NetworkingManager::TextList;

constexpr const char* kStoreFailed = "failed error code"; // in the log lines that tell of the store's error

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

std::string shown(const Text& text) {
    return text ? printable(*text) : "-";
}

std::string shown(const TextList& list) {
    std::string text;
    for (const std::string& each : list.value_or(std::vector<std::string>())) {
        text += (text.empty() ? "" : " ") + printable(each);
    }
    return text.empty() ? "-" : text;
}

std::string shown(bool answer) {
    return answer ? "yes" : "no";
}

std::string entry(const PropertyList::Dictionary& values, const char* key) {
    const auto found = values.find(key);
    return found == values.end() || !found->second.string() ? "" : *found->second.string();
}

void show(Session& session) {
    const NetworkingManager manager;
    if (session.options.json) {
        printJson(session.out, {{"method", asJson(manager.defaultConfigurationMethod())},
                                {"address", asJson(manager.defaultIPAddress())},
                                {"subnetMask", asJson(manager.defaultSubnetMask())},
                                {"router", asJson(manager.defaultRouter())},
                                {"dns", asJson(manager.defaultDNS())},
                                {"searchDomains", asJson(manager.defaultSearchDomains())}});
        return;
    }
    session.out << "Method:          " << shown(manager.defaultConfigurationMethod())
                << "\nAddress:         " << shown(manager.defaultIPAddress())
                << "\nSubnet mask:     " << shown(manager.defaultSubnetMask())
                << "\nRouter:          " << shown(manager.defaultRouter())
                << "\nDNS servers:     " << shown(manager.defaultDNS())
                << "\nSearch domains:  " << shown(manager.defaultSearchDomains()) << '\n';
}

void listPorts(Session& session) {
    const std::vector<PropertyList::Dictionary> ports = machinePortList();
    if (session.options.json) {
        Json list = Json::array();
        for (const PropertyList::Dictionary& port : ports) {
            list.push_back({{"device", entry(port, WLMachinePortUID)},
                            {"kind", entry(port, WLMachinePortConnectionType)},
                            {"name", entry(port, WLMachinePortName)}});
        }
        printJson(session.out, {{"ports", list}});
        return;
    }
    if (ports.empty()) {
        session.out << "This machine has no network ports.\n";
        return;
    }
    TextTable table({"DEVICE", "KIND", "NAME"});
    for (const PropertyList::Dictionary& port : ports) {
        table.addRow({entry(port, WLMachinePortUID), entry(port, WLMachinePortConnectionType),
                      entry(port, WLMachinePortName)});
    }
    table.print(session.out);
}

void probe(Session& session) {
    struct Answers {
        bool isReachable = false;
        bool hasCable = false;
        bool isDynamic = false;
        bool hasDirectories = false;
        bool isInternal = false;
    } answers;
    {
        const WaitingLine waiting("Asking the network", true);
        NetworkingManager manager;
        answers.isReachable = NetworkingManager::internetIsReachable();
        answers.hasCable = manager.isEthernetCablePluggedIn();
        answers.isDynamic = manager.hasUsableDynamicEthernetConfiguration();
        answers.hasDirectories = manager.dirServiceNodesExist();
        answers.isInternal = NetworkingManager::isOnCorvidInternalNetwork();
    }
    if (session.options.json) {
        printJson(session.out, {{"internetIsReachable", answers.isReachable},
                                {"isEthernetCablePluggedIn", answers.hasCable},
                                {"hasUsableDynamicEthernetConfiguration", answers.isDynamic},
                                {"dirServiceNodesExist", answers.hasDirectories},
                                {"isOnCorvidInternalNetwork", answers.isInternal}});
        return;
    }
    session.out << "The internet is reachable:      " << shown(answers.isReachable)
                << "\nAn Ethernet cable is in:        " << shown(answers.hasCable)
                << "\nDynamic configuration usable:   " << shown(answers.isDynamic)
                << "\nNetwork directories reachable:  " << shown(answers.hasDirectories)
                << "\nOn the maker's own network:     " << shown(answers.isInternal) << '\n';
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

// Why the configuration could not be stored or put to use, to go behind the text for people; nothing when the
// last line of the log tells of something else.
std::string storeFailure(const KeptLog& log) {
    const std::string line = log.reason();
    return line.find(kStoreFailed) == std::string::npos ? "" : " (" + line + ")";
}

void apply(Session& session, const Settings& settings) {
    checkSettings(settings);
    PropertyList::Dictionary error;
    bool succeeded = false;
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
        succeeded = manager.applySettings(&error);
    }
    if (!succeeded) {
        throw CommandFailure(entry(error, "title") + ". " + entry(error, "body") + storeFailure(session.log));
    }
    const bool applied = !leaveNothingToDo(settings);
    if (session.options.json) {
        printJson(session.out, {{"applied", applied}});
    } else {
        session.out << (applied ? "Done.\n"
                                : "Nothing was to be done: nothing is configured, and nothing checked.\n");
    }
}

void registerServices(Session& session) {
    std::vector<std::string> names;
    {
        const WaitingLine waiting("Waiting for the network configuration", true);
        NetworkingManager manager;
        manager.registerNewNetworkServices();
        const auto set = manager.systemPreferences()->copyCurrentSet();
        const auto services = set ? set->copyServices() : std::nullopt;
        if (!services) {
            throw CommandFailure("there is no network configuration: " + session.log.reason());
        }
        for (const auto& service : *services) {
            names.push_back(service->name().value_or("-"));
        }
    }
    // The last line says what came of it.
    const std::string outcome = session.log.reason();
    if (outcome.find(kStoreFailed) != std::string::npos) {
        throw CommandFailure(outcome);
    }
    if (session.options.json) {
        printJson(session.out, {{"services", names}});
        return;
    }
    session.out << "The network services are stored:\n";
    for (const std::string& name : names) {
        session.out << "  " << printable(name) << '\n';
    }
}

void addApplyCommand(CommandLine& commandLine, CLI::App& group) {
    const auto settings = std::make_shared<Settings>();
    CLI::App& command = commandLine.addCommand(group, "apply",
                                               "Configure the network of this machine, also with --root, as "
                                               "the user chooses, and check that it works",
                                               [=](Session& session) { apply(session, *settings); });
    command.add_option("--choice", settings->choice, "lan, wifi or no; only lan configures anything")
        ->required()
        ->check(CLI::IsMember({kUserChoiceLAN, kUserChoiceWiFi, kUserChoiceNoInternet}));
    command
        .add_option("--method", settings->method,
                    "Manual, Manual DHCP, DHCP or BootP; DHCP when none is given")
        ->check(CLI::IsMember({kConfigurationMethodManual, kConfigurationMethodManualDHCP,
                               kConfigurationMethodDHCP, kConfigurationMethodBootP}));
    command.add_option("--ip", settings->address, "The address")->type_name("A");
    command.add_option("--subnet", settings->subnetMask, "The subnet mask, such as 255.255.255.0")
        ->type_name("M");
    command.add_option("--router", settings->router, "The router; none when it is left out")->type_name("R");
    command.add_option("--dns", settings->dns, "A DNS server; may be given several times")
        ->type_name("A")
        ->allow_extra_args(false);
    command.add_option("--dhcp-client-id", settings->dhcpClientID, "The DHCP client ID")->type_name("ID");
    command
        .add_option(
            "--warning-type", settings->warningType,
            "0: configure and check nothing; 1: wait for the internet; 2: fail; others: check nothing")
        ->type_name("N")
        ->check([](const std::string& text) {
            return std::string(text.starts_with('-') ? "a warning type cannot be negative" : "");
        })
        ->capture_default_str();
    command.add_option("--wait", settings->wait, "How long to wait for the internet")
        ->type_name("SECONDS")
        ->capture_default_str();
}

} // namespace

void addNetworkCommands(CommandLine& commandLine) {
    CLI::App& group =
        commandLine.addGroup("network", "The network: what it is configured to, and whether it works");
    commandLine.addCommand(group, "show", "Show what the primary connection is configured to now", show);
    commandLine.addCommand(group, "ports", "List the network ports of this machine", listPorts);
    commandLine.addCommand(group, "probe", "Ask whether the network works", probe);
    addApplyCommand(commandLine, group);
    commandLine.addCommand(group, "register", "Store a service for every network port that has none",
                           registerServices);
}

} // namespace welcomer::tool
