#include "backends/local/network/LocalNetworkConfigStore.h"

#include "backends/local/network/KernelApplier.h"
#include "backends/local/network/MachineInterfaces.h"
#include "backends/local/network/NetworkFile.h"
#include "backends/local/network/NetworkRights.h"
#include "backends/network/StoredConfiguration.h"

#include <algorithm>
#include <utility>

namespace welcomer::local {

namespace {

using network::ChangedService;
using network::Outcome;
using network::StoredService;

StoredService storedService(const PropertyList::Dictionary& content, const std::string& id,
                            const std::vector<MachineLink>& links) {
    StoredService service;
    service.id = id;
    service.name = networkfile::serviceText(content, id, "Name");
    service.device = networkfile::serviceText(content, id, "Device");
    service.interface = service.device ? makeInterface(links, *service.device) : nullptr;
    service.protocols = networkfile::protocols(content, id);
    return service;
}

StoredService newService(const PropertyList::Dictionary& content, const std::vector<MachineLink>& links,
                         const MachineLink& link) {
    StoredService service;
    service.id = networkfile::newServiceID(content, link.link.name);
    service.name = displayNameOf(link.type, link.link.name);
    service.device = link.link.name;
    service.interface = makeInterface(links, link);
    service.protocols = network::defaultProtocols();
    service.isStored = false;
    return service;
}

// Puts the changes of one service into what is in the file.
Outcome storeInto(PropertyList::Dictionary& content, ChangedService& changed) {
    StoredService& service = changed.service;
    if (!service.isStored) {
        const auto existing = networkfile::serviceOfDevice(content, *service.device); // others may be faster
        service.id = existing ? *existing
                              : networkfile::addService(content, *service.device, service.name.value_or(""));
    } else if (!networkfile::hasService(content, service.id)) {
        return {platform::kNetworkConfigNotFound, service.id};
    }
    Outcome outcome = service.rebase(networkfile::protocols(content, service.id), changed.configuration);
    if (outcome) {
        networkfile::setProtocols(content, service.id, service.protocols);
        if (service.isEnabled) {
            networkfile::setEnabled(content, service.id, *service.isEnabled);
        }
    }
    return outcome;
}

class FileAndKernel final : public network::Backing {
  public:
    FileAndKernel(const posix::RootFolder& root, network::NameServerService* nameServers)
        : _applier(root, nameServers),
          _file(root) {}

    std::optional<std::vector<StoredService>> load() override {
        const PropertyList::Dictionary content = _file.read();
        const auto ids = networkfile::services(content);
        if (!ids) {
            return std::nullopt;
        }
        const std::vector<MachineLink> links = listMachineLinks();
        std::vector<StoredService> services;
        for (const std::string& id : *ids) {
            StoredService service = storedService(content, id, links);
            if (!service.device || !isPort(links, *service.device)) {
                services.push_back(std::move(service));
            }
        }
        const std::set<std::string> known = networkfile::devices(content);
        for (const MachineLink& link : listHardware(links)) {
            if (!known.contains(link.link.name)) {
                services.push_back(newService(content, links, link));
            }
        }
        return services;
    }

    Outcome store(std::vector<ChangedService>& changed) override {
        if (!mayChangeNetwork()) {
            return {platform::kNetworkConfigAccessDenied};
        }
        if (changed.empty()) {
            return {};
        }
        return _file.change([&](PropertyList::Dictionary& content) {
            for (ChangedService& each : changed) {
                if (Outcome outcome = storeInto(content, each); !outcome) {
                    return outcome;
                }
            }
            return Outcome();
        });
    }

    Outcome apply(const StoredService& service, const network::IPv4Configuration& configuration) override {
        if (!service.device) {
            return {platform::kNetworkConfigNotFound, service.id};
        }
        Outcome outcome;
        outcome.status = _applier.apply(configuration, *service.device, outcome.detail);
        return outcome;
    }

  private:
    KernelApplier _applier;
    const NetworkFile _file;
};

} // namespace

std::shared_ptr<platform::NetworkConfigConnection> LocalNetworkConfigStore::open(const std::string&) {
    return network::openStoredConfiguration([root = _root, nameServers = _nameServers] {
        return std::make_unique<FileAndKernel>(root, nameServers);
    });
}

std::vector<std::shared_ptr<platform::NetworkInterface>> LocalNetworkConfigStore::copyInterfaces() {
    const std::vector<MachineLink> links = listMachineLinks();
    std::vector<std::shared_ptr<platform::NetworkInterface>> interfaces;
    interfaces.reserve(links.size());
    for (const MachineLink& link : links) {
        interfaces.push_back(makeInterface(links, link));
    }
    return interfaces;
}

} // namespace welcomer::local
