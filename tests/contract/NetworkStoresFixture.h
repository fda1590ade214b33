// What the tests of the network's stores have in common: a network namespace with a backend on it.

#pragma once

#include "tests/contract/NetworkBackends.h"
#include "tests/contract/TemporaryRoot.h"
#include "tests/support/NetworkNamespace.h"

#include <gtest/gtest.h>

#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace welcomer {

using Dictionary = PropertyList::Dictionary;
using Array = PropertyList::Array;
using Key = platform::NetworkStateKey;
using platform::NetworkDomain;
using platform::NetworkEntity;

class NetworkStoresFixture : public testing::Test {
  protected:
    void start(const NetworkBackendMaker& make);

    // State

    std::optional<Dictionary> value(const Key& key) {
        return backend->stateStore().open("a test")->copyValue(key);
    }
    std::optional<Dictionary> globalIPv4() {
        return value(Key::global(NetworkDomain::State, NetworkEntity::IPv4));
    }
    std::optional<Dictionary> serviceIPv4(const std::string& id) {
        return value(Key::service(NetworkDomain::State, id, NetworkEntity::IPv4));
    }
    std::optional<Dictionary> link(const std::string& device) {
        return value(Key::interface(NetworkDomain::State, device, NetworkEntity::Link));
    }
    static Dictionary active(bool isActive) { return {{"Active", isActive}}; }

    // Configuration

    platform::NetworkConfigStore& store() { return backend->configStore(); }

    // Each interface as "type device name", with "> " and what it stands on.
    static std::string shown(platform::NetworkInterface* interface);
    std::vector<std::string> interfaces();
    // The interfaces of all services of a connection, in their order.
    static std::vector<std::string> serviceInterfaces(platform::NetworkConfigConnection& connection);

    // The service of a device, or null.
    static std::shared_ptr<platform::NetworkService> serviceOf(platform::NetworkConfigConnection& connection,
                                                               const std::string& device);
    std::string idOf(const std::string& device) {
        return *serviceOf(*store().open("a test"), device)->serviceID();
    }

    // What is stored of a device's service: the IPv4 and the DNS configuration.
    std::vector<std::optional<Dictionary>> stored(const std::string& device);

    // Sets the protocols of a device's service, commits and applies.
    //  result  the last error of applying, or 0; `errorText` has its text
    std::int32_t configure(const std::string& device, const Dictionary& ipv4, const Dictionary& dns = {});

    // Sets the protocols of a device's service, which must not be committed, nor anything be stored of them.
    //  result  the last error of committing; `errorText` has its text
    std::int32_t refusal(const std::string& device, const Dictionary& ipv4, const Dictionary& dns = {});

    static Dictionary manual(const std::string& address, const std::string& mask, const std::string& router) {
        return {{"ConfigMethod", "Manual"},
                {"Addresses", Array{address}},
                {"SubnetMasks", Array{mask}},
                {"Router", router}};
    }

    // The machine

    static std::string addresses(const std::string& device) {
        return shell("ip -4 -o addr show dev " + device + " | awk '{print $4}' | xargs");
    }
    // Whether a route's link is down the kernel tells some time after the link itself tells it.
    static std::string defaultRoutes() {
        return shell("ip -4 route show default | sed 's/ linkdown//; s/ *$//'");
    }
    // Without what each backend chooses by itself.
    static std::string plainDefaultRoutes() {
        return shell("ip -4 route show default | sed 's/ metric.*//; s/ linkdown//; s/ *$//'");
    }

    // A pair whose other end is up too, and which the backend has noticed.
    void addPair(const std::string& device);

    TemporaryRoot root;
    std::unique_ptr<NetworkBackend> backend;
    std::string errorText;

  private:
    void _set(platform::NetworkConfigConnection& connection, const std::string& device,
              const Dictionary& ipv4, const Dictionary& dns);
};

// On every backend.
class NetworkStoresContract : public NetworkStoresFixture,
                              public testing::WithParamInterface<NamedNetworkBackend> {
  protected:
    void SetUp() override { start(GetParam().make); }
};

// On the kernel alone.
class KernelNetworkStores : public NetworkStoresFixture {
  protected:
    void SetUp() override { start(networkBackends().front().make); }
};

} // namespace welcomer
