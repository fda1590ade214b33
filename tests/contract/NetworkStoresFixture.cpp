#include "tests/contract/NetworkStoresFixture.h"

namespace welcomer {

void NetworkStoresFixture::start(const NetworkBackendMaker& make) {
    if (!mayHaveNetwork()) {
        GTEST_SKIP() << "needs the right to make a network namespace";
    }
    enterNetworkNamespace();
    backend = make(root);
    root.addFile("/etc/resolv.conf", "# kept\nnameserver 192.0.2.53\nsearch home.example other.example\n");
}

std::string NetworkStoresFixture::shown(platform::NetworkInterface* interface) {
    std::string text;
    for (; interface; interface = interface->underlyingInterface()) {
        text += (text.empty() ? "" : " > ") + interface->type().value_or("none") + " " +
                interface->deviceName().value_or("none");
    }
    return text;
}

std::vector<std::string> NetworkStoresFixture::interfaces() {
    std::vector<std::string> all;
    for (const auto& each : store().copyInterfaces()) {
        all.push_back(shown(each.get()));
    }
    return all;
}

std::vector<std::string>
NetworkStoresFixture::serviceInterfaces(platform::NetworkConfigConnection& connection) {
    std::vector<std::string> all;
    const auto services = connection.copyCurrentSet()->copyServices();
    for (const auto& each : services.value()) {
        all.push_back(shown(each->interface()));
    }
    return all;
}

std::shared_ptr<platform::NetworkService>
NetworkStoresFixture::serviceOf(platform::NetworkConfigConnection& connection, const std::string& device) {
    const auto set = connection.copyCurrentSet();
    const auto services = set ? set->copyServices() : std::nullopt;
    if (!services) {
        return nullptr;
    }
    for (const auto& each : *services) {
        if (each->interface()->deviceName() == device) {
            return each;
        }
    }
    return nullptr;
}

std::vector<std::optional<Dictionary>> NetworkStoresFixture::stored(const std::string& device) {
    const auto service = serviceOf(*store().open("a test"), device);
    return {service->copyProtocol("IPv4")->configuration(), service->copyProtocol("DNS")->configuration()};
}

void NetworkStoresFixture::_set(platform::NetworkConfigConnection& connection, const std::string& device,
                                const Dictionary& ipv4, const Dictionary& dns) {
    const auto service = serviceOf(connection, device);
    ASSERT_NE(service, nullptr) << "no service of " << device;
    EXPECT_TRUE(service->copyProtocol("IPv4")->setConfiguration(ipv4));
    if (!dns.empty()) {
        EXPECT_TRUE(service->copyProtocol("DNS")->setConfiguration(dns));
    }
}

std::int32_t NetworkStoresFixture::configure(const std::string& device, const Dictionary& ipv4,
                                             const Dictionary& dns) {
    const auto connection = store().open("a test");
    _set(*connection, device, ipv4, dns);
    EXPECT_TRUE(connection->commitChanges()) << connection->lastErrorText();
    const bool isApplied = connection->applyChanges();
    EXPECT_EQ(isApplied, connection->lastErrorCode() == 0);
    errorText = connection->lastErrorText();
    return connection->lastErrorCode();
}

std::int32_t NetworkStoresFixture::refusal(const std::string& device, const Dictionary& ipv4,
                                           const Dictionary& dns) {
    const auto before = stored(device);
    const auto connection = store().open("a test");
    _set(*connection, device, ipv4, dns);
    EXPECT_FALSE(connection->commitChanges());
    const std::int32_t code = connection->lastErrorCode();
    errorText = connection->lastErrorText();
    EXPECT_EQ(stored(device), before);
    EXPECT_TRUE(connection->applyChanges()) << connection->lastErrorText(); // nothing of it
    return code;
}

void NetworkStoresFixture::addPair(const std::string& device) {
    shell("ip link add " + device + " type veth peer name p-" + device + " && ip link set " + device +
          " up && ip link set p-" + device + " up");
    backend->waitForDevice(device);
}

} // namespace welcomer
