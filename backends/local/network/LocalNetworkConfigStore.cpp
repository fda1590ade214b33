#include "backends/local/network/LocalNetworkConfigStore.h"

#include "backends/local/network/MachineInterfaces.h"
#include "backends/local/network/NetworkApplication.h"
#include "backends/local/network/NetworkFile.h"

#include <algorithm>
#include <functional>
#include <iterator>
#include <set>
#include <utility>

namespace welcomer::local {

namespace {

using Dictionary = PropertyList::Dictionary;

thread_local std::int32_t lastError = platform::kNetworkConfigSuccess;
thread_local std::string lastDetail; // of that error, for people

// Keeps the status of an operation as the last error.
//  detail  what it was about and what the system said, where that is known
bool succeeded(std::int32_t status, const std::string& detail = {}) {
    lastError = status;
    lastDetail = detail;
    return status == platform::kNetworkConfigSuccess;
}

// What a connection and its handles work on.
class Core {
  public:
    Core(const posix::RootFolder& root, NameServerService* nameServers)
        : _root(root),
          _file(root),
          _nameServers(nameServers) {
        reload();
    }

    void reload() {
        _changes.clear();
        _configured.clear();
        _content = _file.read();
        _links = listMachineLinks();
        _addHardware();
    }

    bool hasSet() const { return networkfile::services(_content).has_value(); }
    const Dictionary& content() const { return _content; }
    const std::vector<MachineLink>& links() const { return _links; }

    // Has the services of hardware stored that are only listed so far.
    bool establish() {
        _links = listMachineLinks();
        _addHardware();
        const bool isAnythingNew = !_onlyListed.empty();
        if (isAnythingNew) {
            _change([added = std::exchange(_onlyListed, {})](Dictionary& content) {
                networkfile::addServices(content, added);
            });
        }
        succeeded(platform::kNetworkConfigSuccess);
        return isAnythingNew;
    }

    // Changes a service here and, once that is committed, in the file.
    bool changeService(const std::string& serviceID, const std::function<void(Dictionary&)>& change) {
        const auto device = networkfile::serviceText(_content, serviceID, "Device");
        if (!device) {
            return succeeded(platform::kNetworkConfigNotFound);
        }
        const auto listed = std::ranges::find(_onlyListed, *device, &networkfile::NewService::device);
        if (listed != _onlyListed.end()) {
            const networkfile::NewService service = *listed;
            _onlyListed.erase(listed);
            _change([service](Dictionary& content) { networkfile::addServices(content, {service}); });
        }
        _change(change);
        return succeeded(platform::kNetworkConfigSuccess);
    }

    void noteConfigured(const std::string& serviceID) { _configured.insert(serviceID); }

    bool commit() {
        if (!mayChangeNetwork()) {
            return succeeded(platform::kNetworkConfigAccessDenied);
        }
        if (!_changes.empty()) {
            platform::Error error;
            const std::int32_t status = _file.change(_changes, _content, error);
            if (!succeeded(status, error.message)) {
                return false;
            }
            _changes.clear();
            _onlyListed.clear();
            _addHardware();
        }
        _committed.merge(_configured);
        _configured.clear();
        return succeeded(platform::kNetworkConfigSuccess);
    }

    bool apply() {
        std::int32_t first = platform::kNetworkConfigSuccess;
        std::string firstDetail;
        for (const std::string& serviceID : std::exchange(_committed, {})) {
            std::string detail;
            const std::int32_t status = _apply(serviceID, detail);
            if (status != platform::kNetworkConfigSuccess) {
                _committed.insert(serviceID); // to be tried again
                if (first == platform::kNetworkConfigSuccess) {
                    first = status;
                    firstDetail = detail;
                }
            }
        }
        return succeeded(first, firstDetail);
    }

  private:
    void _change(const std::function<void(Dictionary&)>& change) {
        change(_content);
        _changes.push_back(change);
    }

    // Lists a service for every piece of hardware that has none.
    void _addHardware() {
        if (!hasSet()) {
            return;
        }
        const std::set<std::string> known = networkfile::devices(_content);
        std::vector<networkfile::NewService> added;
        for (const MachineLink& link : listHardware(_links)) {
            const std::string& device = link.link.name;
            if (!known.contains(device)) {
                added.push_back({device, displayNameOf(link.type, device)});
            }
        }
        networkfile::addServices(_content, added);
        std::ranges::move(added, std::back_inserter(_onlyListed));
    }

    std::int32_t _apply(const std::string& serviceID, std::string& detail) const {
        const auto device = networkfile::serviceText(_content, serviceID, "Device");
        if (!device) {
            detail = serviceID;
            return platform::kNetworkConfigNotFound;
        }
        return applyNetworkConfiguration(
            _root, *device, networkfile::configuration(_content, serviceID, platform::kNetworkProtocolIPv4),
            networkfile::configuration(_content, serviceID, platform::kNetworkProtocolDNS), detail,
            _nameServers);
    }

    const posix::RootFolder _root;
    const NetworkFile _file;
    NameServerService* const _nameServers;
    Dictionary _content; // what was stored, with the changes and the services that are only listed
    std::vector<std::function<void(Dictionary&)>> _changes;
    std::vector<networkfile::NewService> _onlyListed;
    std::vector<MachineLink> _links;
    std::set<std::string> _configured; // services with changes of protocols that are not committed
    std::set<std::string> _committed;  // and those that are, but not applied
};

class Protocol final : public platform::NetworkProtocol {
  public:
    Protocol(std::shared_ptr<Core> core, std::string serviceID, std::string type)
        : _core(std::move(core)),
          _serviceID(std::move(serviceID)),
          _type(std::move(type)) {}

    std::optional<std::string> type() override { return _type; }
    std::optional<Dictionary> configuration() override {
        return networkfile::configuration(_core->content(), _serviceID, _type);
    }
    bool setConfiguration(const Dictionary& configuration) override {
        const bool isChanged = _core->changeService(_serviceID, [=, *this](Dictionary& content) {
            networkfile::setConfiguration(content, _serviceID, _type, configuration);
        });
        if (isChanged) {
            _core->noteConfigured(_serviceID);
        }
        return isChanged;
    }

  private:
    std::shared_ptr<Core> _core;
    std::string _serviceID;
    std::string _type;
};

class Service final : public platform::NetworkService {
  public:
    Service(std::shared_ptr<Core> core, std::string serviceID)
        : _core(std::move(core)),
          _serviceID(std::move(serviceID)) {
        if (const auto device = networkfile::serviceText(_core->content(), _serviceID, "Device")) {
            _interface = makeInterface(_core->links(), *device);
        }
    }

    std::optional<std::string> name() override {
        return networkfile::serviceText(_core->content(), _serviceID, "Name");
    }
    std::optional<std::string> serviceID() override { return _serviceID; }
    platform::NetworkInterface* interface() override { return _interface.get(); }

    bool setEnabled(bool enabled) override {
        return _core->changeService(_serviceID, [enabled, serviceID = _serviceID](Dictionary& content) {
            networkfile::setEnabled(content, serviceID, enabled);
        });
    }

    std::shared_ptr<platform::NetworkProtocol> copyProtocol(const std::string& type) override {
        return _has(type) ? std::make_shared<Protocol>(_core, _serviceID, type) : nullptr;
    }

    bool addProtocolType(const std::string& type) override {
        if (_has(type)) {
            return succeeded(platform::kNetworkConfigAlreadyThere);
        }
        return _core->changeService(_serviceID, [type, serviceID = _serviceID](Dictionary& content) {
            networkfile::addProtocol(content, serviceID, type);
        });
    }

    std::optional<std::vector<std::shared_ptr<platform::NetworkProtocol>>> copyProtocols() override {
        std::vector<std::shared_ptr<platform::NetworkProtocol>> protocols;
        for (const std::string& type : networkfile::protocolTypes(_core->content(), _serviceID)) {
            protocols.push_back(std::make_shared<Protocol>(_core, _serviceID, type));
        }
        return protocols;
    }

  private:
    bool _has(const std::string& type) const {
        const auto types = networkfile::protocolTypes(_core->content(), _serviceID);
        return std::ranges::count(types, type) > 0;
    }

    const std::shared_ptr<Core> _core;
    const std::string _serviceID;
    std::unique_ptr<platform::NetworkInterface> _interface;
};

class Set final : public platform::NetworkSet {
  public:
    explicit Set(std::shared_ptr<Core> core) : _core(std::move(core)) {}

    std::optional<std::vector<std::shared_ptr<platform::NetworkService>>> copyServices() override {
        const auto serviceIDs = networkfile::services(_core->content());
        if (!serviceIDs) {
            succeeded(platform::kNetworkConfigNotFound);
            return std::nullopt;
        }
        std::vector<std::shared_ptr<platform::NetworkService>> services;
        services.reserve(serviceIDs->size());
        for (const std::string& serviceID : *serviceIDs) {
            services.push_back(std::make_shared<Service>(_core, serviceID));
        }
        return services;
    }

    bool establishDefaultConfiguration() override { return _core->establish(); }

  private:
    const std::shared_ptr<Core> _core;
};

class Connection final : public platform::NetworkConfigConnection {
  public:
    Connection(const posix::RootFolder& root, NameServerService* nameServers)
        : _core(std::make_shared<Core>(root, nameServers)) {}

    std::shared_ptr<platform::NetworkSet> copyCurrentSet() override {
        return _core->hasSet() ? std::make_shared<Set>(_core) : nullptr;
    }
    bool commitChanges() override { return _core->commit(); }
    bool applyChanges() override { return _core->apply(); }
    void synchronize() override { _core->reload(); }

  private:
    const std::shared_ptr<Core> _core;
};

} // namespace

std::shared_ptr<platform::NetworkConfigConnection> LocalNetworkConfigStore::open(const std::string&) {
    return std::make_shared<Connection>(_root, _nameServers);
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

std::int32_t LocalNetworkConfigStore::lastErrorCode() {
    return lastError;
}

std::string LocalNetworkConfigStore::errorText(std::int32_t code) {
    const std::string text = platform::networkConfigStatusText(code);
    return code != lastError || lastDetail.empty() ? text : text + " (" + lastDetail + ")";
}

} // namespace welcomer::local
