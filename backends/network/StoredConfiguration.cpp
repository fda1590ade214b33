#include "backends/network/StoredConfiguration.h"

#include <algorithm>
#include <utility>

namespace welcomer::network {

namespace {

using Dictionary = PropertyList::Dictionary;

// What a connection and its handles work on.
class Core {
  public:
    Core(BackingMaker make, std::unique_ptr<Backing> backing)
        : _make(std::move(make)),
          _backing(std::move(backing)) {
        _load();
    }

    void reload() {
        if (auto backing = _make()) {
            _backing = std::move(backing);
        }
        _load();
    }

    bool keep(Outcome outcome) {
        _last = outcome ? Outcome() : std::move(outcome); // a success is about nothing
        return static_cast<bool>(_last);
    }
    bool keep(std::int32_t status) { return keep(Outcome{status}); }
    const Outcome& last() const { return _last; }

    bool hasSet() const { return _hasSet; }
    const std::vector<StoredService>& services() const { return _services; }

    // Null when there is none any more. Borrowed until there are others.
    StoredService* find(const std::string& id) {
        const auto found = std::ranges::find(_services, id, &StoredService::id);
        return found == _services.end() ? nullptr : &*found;
    }

    bool establish() {
        _addHardware();
        bool isAnythingNew = false;
        for (StoredService& service : _services) {
            if (!service.isStored && !service.isChanged()) {
                service.isEstablished = true;
                isAnythingNew = true;
            }
        }
        keep(platform::kNetworkConfigSuccess);
        return isAnythingNew;
    }

    bool change(const std::string& id, const std::string& type,
                const std::optional<Dictionary>& configuration) {
        StoredService* const service = find(id);
        if (service) {
            service->protocols[type] = configuration;
            service->changedTypes.insert(type);
        }
        return keep(service ? platform::kNetworkConfigSuccess : platform::kNetworkConfigNotFound);
    }

    bool enable(const std::string& id, bool isEnabled) {
        StoredService* const service = find(id);
        if (service) {
            service->isEnabled = isEnabled;
        }
        return keep(service ? platform::kNetworkConfigSuccess : platform::kNetworkConfigNotFound);
    }

    bool commit() {
        std::vector<ChangedService> changed;
        for (StoredService& service : _services) {
            if (service.isChanged()) {
                changed.push_back({service, {}});
            }
        }
        if (!keep(_backing->store(changed))) {
            return false;
        }
        for (auto& [service, configuration] : changed) {
            if (service.isConfigured()) {
                _committed.insert_or_assign(service.id, std::move(configuration));
            }
            service.isStored = true;
            service.changedTypes.clear();
            service.isEnabled.reset();
            service.isEstablished = false;
        }
        return true;
    }

    bool apply() {
        Outcome first;
        std::erase_if(_committed, [&](const auto& each) {
            Outcome outcome = _apply(each.first, each.second);
            const bool isApplied = static_cast<bool>(outcome);
            if (first) {
                first = std::move(outcome);
            }
            return isApplied; // what failed is tried again
        });
        return keep(std::move(first));
    }

  private:
    void _load() {
        std::optional<std::vector<StoredService>> loaded = _backing->load();
        _hasSet = loaded.has_value();
        _services = std::move(loaded).value_or(std::vector<StoredService>());
    }

    Outcome _apply(const std::string& id, const IPv4Configuration& configuration) {
        const StoredService* const service = find(id);
        return service ? _backing->apply(*service, configuration)
                       : Outcome{platform::kNetworkConfigNotFound, id};
    }

    // Lists the hardware that has come since.
    void _addHardware() {
        for (StoredService& service : _backing->load().value_or(std::vector<StoredService>())) {
            const bool isListed = std::ranges::count(_services, service.device, &StoredService::device) > 0;
            if (!service.isStored && !isListed) {
                _services.push_back(std::move(service));
            }
        }
    }

    const BackingMaker _make;
    std::unique_ptr<Backing> _backing;
    bool _hasSet = false;
    std::vector<StoredService> _services;
    std::map<std::string, IPv4Configuration> _committed; // by service, what is to be applied
    Outcome _last;
};

// What every handle has.
template <class Interface>
class Handle : public Interface {
  public:
    explicit Handle(std::shared_ptr<Core> core) : _core(std::move(core)) {}

    std::int32_t lastErrorCode() const override { return _core->last().status; }
    std::string lastErrorText() const override {
        const Outcome& last = _core->last();
        const std::string text = platform::networkConfigStatusText(last.status);
        return last.detail.empty() ? text : text + " (" + last.detail + ")";
    }

  protected:
    const std::shared_ptr<Core> _core;
};

class Protocol final : public Handle<platform::NetworkProtocol> {
  public:
    Protocol(std::shared_ptr<Core> core, std::string serviceID, std::string type)
        : Handle(std::move(core)),
          _serviceID(std::move(serviceID)),
          _type(std::move(type)) {}

    std::optional<std::string> type() override { return _type; }

    std::optional<Dictionary> configuration() override {
        const StoredService* const service = _core->find(_serviceID);
        const auto found = service ? service->protocols.find(_type) : Protocols::const_iterator();
        return service && found != service->protocols.end() ? found->second : std::nullopt;
    }

    bool setConfiguration(const Dictionary& configuration) override {
        return _core->change(_serviceID, _type, configuration);
    }

  private:
    const std::string _serviceID;
    const std::string _type;
};

class Service final : public Handle<platform::NetworkService> {
  public:
    Service(std::shared_ptr<Core> core, const StoredService& service)
        : Handle(std::move(core)),
          _serviceID(service.id),
          _interface(service.interface) {}

    std::optional<std::string> name() override {
        const StoredService* const service = _core->find(_serviceID);
        return service ? service->name : std::nullopt;
    }
    std::optional<std::string> serviceID() override { return _serviceID; }
    platform::NetworkInterface* interface() override { return _interface.get(); }
    bool setEnabled(bool enabled) override { return _core->enable(_serviceID, enabled); }

    std::shared_ptr<platform::NetworkProtocol> copyProtocol(const std::string& type) override {
        const StoredService* const service = _core->find(_serviceID);
        return service && service->protocols.contains(type)
                   ? std::make_shared<Protocol>(_core, _serviceID, type)
                   : nullptr;
    }

    bool addProtocolType(const std::string& type) override {
        return copyProtocol(type) ? _core->keep(platform::kNetworkConfigAlreadyThere)
                                  : _core->change(_serviceID, type, std::nullopt);
    }

    std::optional<std::vector<std::shared_ptr<platform::NetworkProtocol>>> copyProtocols() override {
        const StoredService* const service = _core->find(_serviceID);
        _core->keep(service ? platform::kNetworkConfigSuccess : platform::kNetworkConfigNotFound);
        if (!service) {
            return std::nullopt;
        }
        std::vector<std::shared_ptr<platform::NetworkProtocol>> protocols;
        for (const auto& [type, configuration] : service->protocols) {
            protocols.push_back(std::make_shared<Protocol>(_core, _serviceID, type));
        }
        return protocols;
    }

  private:
    const std::string _serviceID;
    const std::shared_ptr<platform::NetworkInterface> _interface;
};

class Set final : public Handle<platform::NetworkSet> {
  public:
    using Handle::Handle;

    std::optional<std::vector<std::shared_ptr<platform::NetworkService>>> copyServices() override {
        if (!_core->keep(_core->hasSet() ? platform::kNetworkConfigSuccess
                                         : platform::kNetworkConfigNotFound)) {
            return std::nullopt;
        }
        std::vector<std::shared_ptr<platform::NetworkService>> services;
        for (const StoredService& service : _core->services()) {
            services.push_back(std::make_shared<Service>(_core, service));
        }
        return services;
    }

    bool establishDefaultConfiguration() override { return _core->establish(); }
};

class Connection final : public Handle<platform::NetworkConfigConnection> {
  public:
    using Handle::Handle;

    std::shared_ptr<platform::NetworkSet> copyCurrentSet() override {
        return _core->hasSet() ? std::make_shared<Set>(_core) : nullptr;
    }
    bool commitChanges() override { return _core->commit(); }
    bool applyChanges() override { return _core->apply(); }
    void synchronize() override { _core->reload(); }
};

} // namespace

const Protocols& defaultProtocols() {
    static const Protocols kDefault = {
        {platform::kNetworkProtocolIPv4,
         Dictionary{{platform::kNetworkConfigMethod, platform::kNetworkMethodDHCP}}},
        {platform::kNetworkProtocolDNS, std::nullopt}};
    return kDefault;
}

bool StoredService::isConfigured() const {
    return std::ranges::any_of(changedTypes,
                               [&](const std::string& type) { return protocols.at(type).has_value(); });
}

Outcome StoredService::rebase(Protocols stored, IPv4Configuration& configuration) {
    for (const std::string& type : changedTypes) {
        if (protocols.at(type) ||
            !stored.contains(type)) { // otherwise somebody has configured what was added
            stored[type] = protocols.at(type);
        }
    }
    protocols = std::move(stored);
    const auto part = [&](const char* type, const auto& read) -> std::optional<Dictionary> {
        const auto found = protocols.find(type);
        const bool counts = found != protocols.end() && (changedTypes.contains(type) || read(found->second));
        return counts ? found->second : std::nullopt;
    };
    const auto ipv4 = part(platform::kNetworkProtocolIPv4,
                           [](const auto& values) { return readIPv4Configuration(values, std::nullopt); });
    const auto dns = part(platform::kNetworkProtocolDNS,
                          [](const auto& values) { return readIPv4Configuration(std::nullopt, values); });
    IPv4Reading reading = readIPv4Configuration(ipv4, dns);
    configuration = std::move(reading.configuration);
    if (!reading && device) {
        reading.detail = reading.detail.empty() ? *device : *device + ": " + reading.detail;
    }
    return {reading.status, std::move(reading.detail)};
}

std::shared_ptr<platform::NetworkConfigConnection> openStoredConfiguration(BackingMaker make) {
    auto backing = make();
    return backing ? std::make_shared<Connection>(std::make_shared<Core>(std::move(make), std::move(backing)))
                   : nullptr;
}

} // namespace welcomer::network
