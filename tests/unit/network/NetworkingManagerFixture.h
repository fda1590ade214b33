// What the tests of the network manager share.

#pragma once

#include "network/NetworkingManager.h"
#include "tests/fakes/FakePlatform.h"

#include <gtest/gtest.h>

#include <chrono>
#include <optional>
#include <string>
#include <vector>

namespace welcomer {

using Lines = std::vector<std::string>;

class NetworkingManagerTest : public testing::Test {
  protected:
    using Dictionary = PropertyList::Dictionary;
    using Array = PropertyList::Array;
    using Key = platform::NetworkStateKey;

    static Key globalKey(platform::NetworkEntity entity) {
        return Key::global(platform::NetworkDomain::State, entity);
    }
    static Key serviceKey(platform::NetworkDomain domain, const std::string& id) {
        return Key::service(domain, id, platform::NetworkEntity::IPv4);
    }

    void setState(const Key& key, const Dictionary& value) { fake.networkStateStore.values[key] = value; }

    // A machine with one service, "one", that has an address.
    void setWholeState() {
        setState(globalKey(platform::NetworkEntity::DNS),
                 {{"ServerAddresses", Array{"192.0.2.53", "192.0.2.54"}}, {"DomainName", "home.example"}});
        setState(globalKey(platform::NetworkEntity::IPv4),
                 {{"Router", "192.0.2.1"}, {"PrimaryService", "one"}});
        setState(serviceKey(platform::NetworkDomain::Setup, "one"), {{"ConfigMethod", "DHCP"}});
        setState(serviceKey(platform::NetworkDomain::State, "one"),
                 {{"Addresses", Array{"192.0.2.7", "192.0.2.8"}},
                  {"SubnetMasks", Array{"255.255.255.0", "255.255.0.0"}}});
    }

    // A service with one interface.
    static fakes::FakeService service(const std::string& id, const std::string& device,
                                      const std::string& type = "Ethernet") {
        fakes::FakeService made;
        made.name = "Service " + id;
        made.id = id;
        made.chain = {{type, device, type + " (" + device + ")"}};
        return made;
    }

    void setLink(const std::string& device, bool isActive) {
        setState(Key::interface(platform::NetworkDomain::State, device, platform::NetworkEntity::Link),
                 {{"Active", isActive}});
    }

    // What was logged since the last time.
    Lines logged() {
        const Lines lines = fake.systemLog.lines();
        fake.systemLog.clear();
        return lines;
    }

    // The calls to the store, and to the clock, that change something or open it.
    Lines storeCalls() const { return fake.recorder.callsTo("NetworkConfigStore."); }

    // A manager whose connection is open and that has not called or logged anything yet.
    NetworkingManager& openManager() {
        manager.emplace();
        manager->systemPreferences();
        fake.recorder.clear();
        logged();
        return *manager;
    }

    std::size_t sleeps() const {
        return static_cast<std::size_t>(std::ranges::count(
            fake.virtualTime.waits(),
            fakes::RecordedTime::Wait{fakes::RecordedTime::Wait::Kind::Sleep, std::chrono::seconds(1)}));
    }

    fakes::FakePlatform fake;
    const platform::ScopedPlatform installed{fake.platform()};
    fakes::FakeNetworkConfigStore& store = fake.networkConfigStore;
    std::optional<NetworkingManager> manager;
};

} // namespace welcomer
