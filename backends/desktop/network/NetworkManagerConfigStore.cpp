#include "backends/desktop/network/NetworkManagerConfigStore.h"

#include "backends/desktop/network/NetworkManagerActivation.h"

#include <algorithm>
#include <set>
#include <utility>

namespace welcomer::desktop {

namespace {

using Dictionary = PropertyList::Dictionary;
using Interfaces = std::vector<std::shared_ptr<platform::NetworkInterface>>;

thread_local std::int32_t lastError = platform::kNetworkConfigSuccess;
thread_local bool isServedByKernel = false; // the connection that this thread opened last

// Keeps the status of an operation as the last error.
bool succeeded(std::int32_t status) {
    lastError = status;
    return status == platform::kNetworkConfigSuccess;
}

// What a connection and its handles work on.
class Core {
  public:
    Core(std::unique_ptr<NetworkManagerClient> client, platform::NetworkConfigStore& kernel)
        : _client(std::move(client)),
          _kernel(kernel) {
        _read();
    }

    void reload() {
        // A client that cannot be had any more leaves nothing to show; changes fail at the old one.
        if (auto fresh = NetworkManagerClient::open(NetworkManagerBus::open())) {
            _client = std::move(fresh);
        }
        _configured.clear();
        _read();
    }

    std::vector<std::string> serviceIDs() const {
        std::vector<std::string> found;
        for (const ServiceRecord& record : _records) {
            found.push_back(record.uuid);
        }
        return found;
    }

    ServiceRecord* find(const std::string& serviceID) {
        const auto found = std::ranges::find(_records, serviceID, &ServiceRecord::uuid);
        return found == _records.end() ? nullptr : &*found;
    }

    std::shared_ptr<platform::NetworkInterface> interfaceOf(const std::optional<std::string>& device) const {
        const auto found = std::ranges::find_if(
            _interfaces, [&](const auto& each) { return each && device && each->deviceName() == device; });
        return found == _interfaces.end() ? nullptr : *found;
    }

    bool establish() {
        _client->refresh();
        _addDevices();
        bool isAnythingNew = false;
        for (ServiceRecord& record : _records) {
            if (record.path.empty() && !record.isChanged()) {
                record.isEstablished = true;
                isAnythingNew = true;
            }
        }
        succeeded(platform::kNetworkConfigSuccess);
        return isAnythingNew;
    }

    bool changeProtocol(const std::string& serviceID, const std::string& type,
                        const std::optional<Dictionary>& configuration) {
        ServiceRecord* const record = find(serviceID);
        if (!record) {
            return succeeded(platform::kNetworkConfigNotFound);
        }
        record->protocols[type] = configuration;
        record->changedProtocols[type] = configuration;
        if (configuration) {
            _configured.insert(serviceID);
        }
        return succeeded(platform::kNetworkConfigSuccess);
    }

    bool enable(const std::string& serviceID, bool isEnabled) {
        ServiceRecord* const record = find(serviceID);
        if (!record) {
            return succeeded(platform::kNetworkConfigNotFound);
        }
        record->enabled = isEnabled;
        return succeeded(platform::kNetworkConfigSuccess);
    }

    bool commit() {
        if (!succeeded(storeServices(*_client, _records))) {
            return false;
        }
        _committed.merge(_configured);
        _configured.clear();
        return true;
    }

    bool apply() {
        std::int32_t first = platform::kNetworkConfigSuccess;
        for (const std::string& serviceID : std::exchange(_committed, {})) {
            const ServiceRecord* const record = find(serviceID);
            const std::int32_t status =
                record ? activateService(*_client, *record) : platform::kNetworkConfigNotFound;
            if (status != platform::kNetworkConfigSuccess) {
                _committed.insert(serviceID); // to be tried again
                first = first == platform::kNetworkConfigSuccess ? status : first;
            }
        }
        return succeeded(first);
    }

  private:
    void _read() { _records = readServices(*_client, _names()); }

    // Lists the devices that have come since.
    void _addDevices() {
        for (ServiceRecord& record : readServices(*_client, _names())) {
            const bool isListed =
                std::ranges::any_of(_records, [&](const auto& each) { return each.device == record.device; });
            if (record.path.empty() && !isListed) {
                _records.push_back(std::move(record));
            }
        }
    }

    std::map<std::string, std::string> _names() {
        _interfaces = _kernel.copyInterfaces();
        std::map<std::string, std::string> names;
        for (const auto& each : _interfaces) {
            const auto device = each ? each->deviceName() : std::nullopt;
            const auto name = each ? each->displayName() : std::nullopt;
            if (device && name) {
                names.emplace(*device, *name);
            }
        }
        return names;
    }

    std::unique_ptr<NetworkManagerClient> _client;
    platform::NetworkConfigStore& _kernel;
    Interfaces _interfaces;
    std::vector<ServiceRecord> _records;
    std::set<std::string> _configured; // services with changes of protocols that are not committed
    std::set<std::string> _committed;  // and those that are, but not applied
};

// An interface of a device that the machine does not have now.
class AbsentInterface final : public platform::NetworkInterface {
  public:
    AbsentInterface(std::string type, std::optional<std::string> device)
        : _type(std::move(type)),
          _device(std::move(device)) {}

    std::optional<std::string> type() const override { return _type; }
    std::optional<std::string> deviceName() const override { return _device; }
    std::optional<std::string> displayName() const override {
        return _device ? _type + " (" + *_device + ")" : _type;
    }
    platform::NetworkInterface* underlyingInterface() const override { return nullptr; }

  private:
    const std::string _type;
    const std::optional<std::string> _device;
};

class Protocol final : public platform::NetworkProtocol {
  public:
    Protocol(std::shared_ptr<Core> core, std::string serviceID, std::string type)
        : _core(std::move(core)),
          _serviceID(std::move(serviceID)),
          _type(std::move(type)) {}

    std::optional<std::string> type() override { return _type; }

    std::optional<Dictionary> configuration() override {
        const ServiceRecord* const record = _core->find(_serviceID);
        const auto found = record ? record->protocols.find(_type) : Protocols::const_iterator();
        return record && found != record->protocols.end() ? found->second : std::nullopt;
    }

    bool setConfiguration(const Dictionary& configuration) override {
        return _core->changeProtocol(_serviceID, _type, configuration);
    }

  private:
    const std::shared_ptr<Core> _core;
    const std::string _serviceID;
    const std::string _type;
};

class Service final : public platform::NetworkService {
  public:
    Service(std::shared_ptr<Core> core, std::string serviceID)
        : _core(std::move(core)),
          _serviceID(std::move(serviceID)) {
        if (const ServiceRecord* const record = _core->find(_serviceID)) {
            _interface = _core->interfaceOf(record->device);
            if (!_interface) {
                _interface = std::make_shared<AbsentInterface>(record->type, record->device);
            }
        }
    }

    std::optional<std::string> name() override {
        const ServiceRecord* const record = _core->find(_serviceID);
        return record ? std::optional(record->name) : std::nullopt;
    }
    std::optional<std::string> serviceID() override { return _serviceID; }
    platform::NetworkInterface* interface() override { return _interface.get(); }
    bool setEnabled(bool enabled) override { return _core->enable(_serviceID, enabled); }

    std::shared_ptr<platform::NetworkProtocol> copyProtocol(const std::string& type) override {
        const ServiceRecord* const record = _core->find(_serviceID);
        return record && record->protocols.contains(type)
                   ? std::make_shared<Protocol>(_core, _serviceID, type)
                   : nullptr;
    }

    bool addProtocolType(const std::string& type) override {
        const ServiceRecord* const record = _core->find(_serviceID);
        if (record && record->protocols.contains(type)) {
            return succeeded(platform::kNetworkConfigAlreadyThere);
        }
        return _core->changeProtocol(_serviceID, type, std::nullopt);
    }

    std::optional<std::vector<std::shared_ptr<platform::NetworkProtocol>>> copyProtocols() override {
        const ServiceRecord* const record = _core->find(_serviceID);
        if (!record) {
            succeeded(platform::kNetworkConfigNotFound);
            return std::nullopt;
        }
        std::vector<std::shared_ptr<platform::NetworkProtocol>> protocols;
        for (const auto& [type, configuration] : record->protocols) {
            protocols.push_back(std::make_shared<Protocol>(_core, _serviceID, type));
        }
        return protocols;
    }

  private:
    const std::shared_ptr<Core> _core;
    const std::string _serviceID;
    std::shared_ptr<platform::NetworkInterface> _interface;
};

class Set final : public platform::NetworkSet {
  public:
    explicit Set(std::shared_ptr<Core> core) : _core(std::move(core)) {}

    std::optional<std::vector<std::shared_ptr<platform::NetworkService>>> copyServices() override {
        std::vector<std::shared_ptr<platform::NetworkService>> services;
        for (const std::string& serviceID : _core->serviceIDs()) {
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
    explicit Connection(std::shared_ptr<Core> core) : _core(std::move(core)) {}

    std::shared_ptr<platform::NetworkSet> copyCurrentSet() override { return std::make_shared<Set>(_core); }
    bool commitChanges() override { return _core->commit(); }
    bool applyChanges() override { return _core->apply(); }
    void synchronize() override { _core->reload(); }

  private:
    const std::shared_ptr<Core> _core;
};

} // namespace

std::shared_ptr<platform::NetworkConfigConnection> NetworkManagerConfigStore::open(const std::string& name) {
    auto client = NetworkManagerClient::open(NetworkManagerBus::open());
    isServedByKernel = client == nullptr;
    if (isServedByKernel) {
        return _kernel.open(name);
    }
    return std::make_shared<Connection>(std::make_shared<Core>(std::move(client), _kernel));
}

std::vector<std::shared_ptr<platform::NetworkInterface>> NetworkManagerConfigStore::copyInterfaces() {
    return _kernel.copyInterfaces();
}

std::int32_t NetworkManagerConfigStore::lastErrorCode() {
    return isServedByKernel ? _kernel.lastErrorCode() : lastError;
}

std::string NetworkManagerConfigStore::errorText(std::int32_t code) {
    return isServedByKernel ? _kernel.errorText(code) : platform::networkConfigStatusText(code);
}

} // namespace welcomer::desktop
