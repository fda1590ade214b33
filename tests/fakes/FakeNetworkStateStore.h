// A network whose state tests choose.

#pragma once

#include "platform/NetworkStateStore.h"
#include "tests/fakes/CallRecorder.h"

#include <map>
#include <memory>
#include <optional>
#include <string>

namespace welcomer::fakes {

// Recorded as "NetworkStateStore.open client", "NetworkStateStore.copyValue State, service one, IPv4" and
// "NetworkStateStore.close". Any thread once the values are chosen; must outlive its connections.
class FakeNetworkStateStore final : public platform::NetworkStateStore {
  public:
    explicit FakeNetworkStateStore(CallRecorder& recorder) : _recorder(recorder) {}

    std::unique_ptr<platform::NetworkStateConnection> open(const std::string& clientName) override {
        _recorder.record("NetworkStateStore.open " + clientName);
        return cannotOpen ? nullptr : std::make_unique<Connection>(*this);
    }

    bool cannotOpen = false;
    std::map<platform::NetworkStateKey, PropertyList::Dictionary> values;

  private:
    class Connection final : public platform::NetworkStateConnection {
      public:
        explicit Connection(FakeNetworkStateStore& store) : _store(store) {}
        ~Connection() override { _store._recorder.record("NetworkStateStore.close"); }

        std::optional<PropertyList::Dictionary> copyValue(const platform::NetworkStateKey& key) override {
            using Key = platform::NetworkStateKey;
            const char* const scopes[] = {"global", "service ", "interface "};
            const char* const entities[] = {"IPv4", "DNS", "Link"};
            _store._recorder.record(std::string("NetworkStateStore.copyValue ") +
                                    (key.domain == platform::NetworkDomain::State ? "State, " : "Setup, ") +
                                    scopes[static_cast<int>(key.scope)] +
                                    (key.scope == Key::Scope::Global ? "" : key.identifier) + ", " +
                                    entities[static_cast<int>(key.entity)]);
            const auto found = _store.values.find(key);
            return found == _store.values.end() ? std::nullopt : std::optional(found->second);
        }

      private:
        FakeNetworkStateStore& _store;
    };

    CallRecorder& _recorder;
};

} // namespace welcomer::fakes
