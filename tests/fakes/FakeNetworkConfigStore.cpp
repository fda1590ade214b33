#include "tests/fakes/FakeNetworkConfigStore.h"

#include "platform/Error.h"
#include "text/Describe.h"

#include <algorithm>
#include <utility>

namespace welcomer::fakes {

namespace {

class Interface final : public platform::NetworkInterface {
  public:
    Interface(const FakeInterfaceChain& chain, std::size_t index) : _values(chain.at(index)) {
        if (index + 1 < chain.size()) {
            _underlying = std::make_unique<Interface>(chain, index + 1);
        }
    }
    std::optional<std::string> type() const override { return _values.type; }
    std::optional<std::string> deviceName() const override { return _values.device; }
    std::optional<std::string> displayName() const override { return _values.name; }
    platform::NetworkInterface* underlyingInterface() const override { return _underlying.get(); }

  private:
    FakeInterface _values;
    std::unique_ptr<Interface> _underlying;
};

// What every handle of the store has.
template <class Base>
class Handle : public Base {
  public:
    explicit Handle(FakeNetworkConfigStore& store) : _store(store) {}

    std::int32_t lastErrorCode() const override { return _store.lastError; }
    std::string lastErrorText() const override { return "text of " + std::to_string(_store.lastError); }

  protected:
    FakeNetworkConfigStore& _store;
};

class Protocol final : public Handle<platform::NetworkProtocol> {
  public:
    Protocol(FakeNetworkConfigStore& store, std::size_t service, std::size_t index)
        : Handle(store),
          _service(service),
          _index(index) {}

    std::optional<std::string> type() override { return _values().type; }
    std::optional<PropertyList::Dictionary> configuration() override { return _values().configuration; }
    bool setConfiguration(const PropertyList::Dictionary& configuration) override {
        _store.record("setConfiguration " + text::describe(_store.services.at(_service).id) + ", " +
                      text::describe(_values().type) + ", " + text::describe(PropertyList(configuration)));
        if (_store.fails("setConfiguration")) {
            return false;
        }
        _values().configuration = configuration;
        return true;
    }

  private:
    FakeProtocol& _values() { return _store.services.at(_service).protocols.at(_index); }

    const std::size_t _service;
    const std::size_t _index;
};

class Service final : public Handle<platform::NetworkService> {
  public:
    Service(FakeNetworkConfigStore& store, std::size_t index) : Handle(store), _index(index) {
        const FakeInterfaceChain& chain = _values().chain;
        if (!chain.empty()) {
            _interface = std::make_unique<Interface>(chain, 0);
        }
    }

    std::optional<std::string> name() override { return _values().name; }
    std::optional<std::string> serviceID() override { return _values().id; }
    platform::NetworkInterface* interface() override { return _interface.get(); }

    bool setEnabled(bool enabled) override {
        _store.record("setEnabled " + text::describe(_values().id) + (enabled ? ", yes" : ", no"));
        if (_store.fails("setEnabled")) {
            return false;
        }
        _values().isEnabled = enabled;
        return true;
    }

    std::shared_ptr<platform::NetworkProtocol> copyProtocol(const std::string& type) override {
        if (_store.fails("copyProtocol " + type) || !_values().protocol(type)) {
            return nullptr;
        }
        return _protocol(static_cast<std::size_t>(_values().protocol(type) - _values().protocols.data()));
    }

    bool addProtocolType(const std::string& type) override {
        _store.record("addProtocolType " + text::describe(_values().id) + ", " + type);
        if (_store.fails("addProtocolType") || _values().protocol(type)) {
            return false;
        }
        _values().protocols.push_back({type, std::nullopt});
        return true;
    }

    std::optional<std::vector<std::shared_ptr<platform::NetworkProtocol>>> copyProtocols() override {
        if (_store.cannotListProtocols) {
            return std::nullopt;
        }
        std::vector<std::shared_ptr<platform::NetworkProtocol>> protocols;
        for (std::size_t index = 0; index < _values().protocols.size(); ++index) {
            protocols.push_back(_values().protocols[index].isAbsent ? nullptr : _protocol(index));
        }
        return protocols;
    }

  private:
    FakeService& _values() { return _store.services.at(_index); }
    std::shared_ptr<platform::NetworkProtocol> _protocol(std::size_t index) {
        return std::make_shared<Protocol>(_store, _index, index);
    }

    const std::size_t _index;
    std::unique_ptr<Interface> _interface;
};

class Set final : public Handle<platform::NetworkSet> {
  public:
    using Handle::Handle;

    std::optional<std::vector<std::shared_ptr<platform::NetworkService>>> copyServices() override {
        if (_store.cannotListServices) {
            return std::nullopt;
        }
        std::vector<std::shared_ptr<platform::NetworkService>> services;
        for (std::size_t index = 0; index < _store.services.size(); ++index) {
            services.push_back(std::make_shared<Service>(_store, index));
        }
        return services;
    }

    bool establishDefaultConfiguration() override {
        _store.record("establish");
        if (_store.fails("establish") || _store.newHardware.empty()) {
            return false;
        }
        std::ranges::move(std::exchange(_store.newHardware, {}), std::back_inserter(_store.services));
        return true;
    }
};

class Connection final : public Handle<platform::NetworkConfigConnection> {
  public:
    using Handle::Handle;
    ~Connection() override { _store.record("close"); }

    std::shared_ptr<platform::NetworkSet> copyCurrentSet() override {
        const bool isThere = _store.hasSet && _store.opened >= _store.setAppearsAfterOpening;
        return isThere ? std::make_shared<Set>(_store) : nullptr;
    }
    bool commitChanges() override {
        _store.record("commit");
        if (_store.fails("commit")) {
            return false;
        }
        _store.stored = _store.services;
        return true;
    }
    bool applyChanges() override {
        _store.record("apply");
        return !_store.fails("apply");
    }
    void synchronize() override {
        _store.record("synchronize");
        if (!_store.stored.empty()) {
            _store.services = _store.stored;
        }
    }
};

} // namespace

const FakeProtocol* FakeService::protocol(const std::string& type) const {
    const auto found = std::ranges::find_if(
        protocols, [&](const FakeProtocol& each) { return !each.isAbsent && each.type == type; });
    return found == protocols.end() ? nullptr : &*found;
}

FakeProtocol* FakeService::protocol(const std::string& type) {
    return const_cast<FakeProtocol*>(std::as_const(*this).protocol(type));
}

std::shared_ptr<platform::NetworkConfigConnection> FakeNetworkConfigStore::open(const std::string& name) {
    record("open " + name);
    ++opened;
    return std::make_shared<Connection>(*this);
}

std::vector<std::shared_ptr<platform::NetworkInterface>> FakeNetworkConfigStore::copyInterfaces() {
    record("copyInterfaces");
    std::vector<std::shared_ptr<platform::NetworkInterface>> copies;
    for (const FakeInterfaceChain& chain : interfaces) {
        copies.push_back(chain.empty() ? nullptr : std::make_shared<Interface>(chain, 0));
    }
    return copies;
}

bool FakeNetworkConfigStore::fails(const std::string& call) {
    if (const auto thrown = exceptions.find(call); thrown != exceptions.end()) {
        throw platform::Exception(thrown->second);
    }
    const auto failure = failures.find(call);
    if (failure != failures.end() && failure->second.after-- <= 0 && failure->second.times-- > 0) {
        lastError = failure->second.code;
        return true;
    }
    lastError = 0;
    return false;
}

} // namespace welcomer::fakes
