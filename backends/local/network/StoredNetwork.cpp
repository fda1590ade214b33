#include "backends/local/network/StoredNetwork.h"

#include "backends/local/network/KernelApplier.h"
#include "backends/local/network/MachineInterfaces.h"
#include "backends/local/network/NetworkFile.h"
#include "platform/NetworkConfigStore.h"

#include <algorithm>
#include <thread>
#include <utility>

namespace welcomer::local {

namespace {

using Dictionary = PropertyList::Dictionary;

constexpr std::chrono::milliseconds kSlice{100};

// A service that is to be used.
struct EnabledService {
    std::string device;
    network::IPv4Reading wanted;
};

bool isEnabled(const Dictionary& content, const std::string& id) {
    const PropertyList* const enabled = networkfile::serviceValue(content, id, "Enabled");
    return !enabled || enabled->boolean() != false;
}

std::vector<EnabledService> enabledServices(const Dictionary& content) {
    std::vector<EnabledService> services;
    for (const std::string& id : networkfile::services(content).value_or(std::vector<std::string>())) {
        auto device = networkfile::serviceText(content, id, "Device");
        if (device && isEnabled(content, id)) {
            const auto configuration = [&](const char* type) {
                return networkfile::configuration(content, id, type);
            };
            services.push_back({std::move(*device), network::readIPv4Configuration(
                                                        configuration(platform::kNetworkProtocolIPv4),
                                                        configuration(platform::kNetworkProtocolDNS))});
        }
    }
    return services;
}

bool isThere(const std::vector<MachineLink>& links, const std::string& device) {
    return std::ranges::any_of(links, [&](const MachineLink& each) { return each.link.name == device; });
}

// The machine's links, once all of these have one or there is no more time.
std::vector<MachineLink> waitForLinks(const std::vector<EnabledService>& services,
                                      std::chrono::milliseconds patience) {
    const auto end = std::chrono::steady_clock::now() + patience;
    while (true) {
        std::vector<MachineLink> links = listMachineLinks();
        const bool isComplete = std::ranges::all_of(
            services, [&](const EnabledService& service) { return isThere(links, service.device); });
        if (isComplete || std::chrono::steady_clock::now() >= end) {
            return links;
        }
        std::this_thread::sleep_for(kSlice);
    }
}

} // namespace

std::vector<RestoredService> restoreStoredNetwork(const posix::RootFolder& root,
                                                  network::NameServerService* nameServers,
                                                  std::chrono::milliseconds patience) {
    const std::vector<EnabledService> services = enabledServices(NetworkFile(root).read());
    const std::vector<MachineLink> links = waitForLinks(services, patience);
    KernelApplier applier(root, nameServers);
    std::vector<RestoredService> restored;
    for (const EnabledService& service : services) {
        if (isPort(links, service.device)) {
            continue;
        }
        network::Outcome outcome{service.wanted.status, service.wanted.detail};
        if (outcome) {
            outcome.status = applier.apply(service.wanted.configuration, service.device, outcome.detail);
        }
        restored.push_back({service.device, std::move(outcome)});
    }
    return restored;
}

} // namespace welcomer::local
