#include "backends/network/StoredConfiguration.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <utility>

namespace welcomer::network {
namespace {

using Array = PropertyList::Array;
using Dictionary = PropertyList::Dictionary;

const std::string kIPv4 = platform::kNetworkProtocolIPv4;
const std::string kDNS = platform::kNetworkProtocolDNS;

Dictionary bootP() {
    return {{platform::kNetworkConfigMethod, platform::kNetworkMethodBootP}};
}
Dictionary manual(const std::string& address) {
    return {{platform::kNetworkConfigMethod, platform::kNetworkMethodManual},
            {platform::kNetworkAddresses, Array{address}},
            {platform::kNetworkSubnetMasks, Array{"255.255.255.0"}}};
}
Dictionary servers(const std::string& server) {
    return {{platform::kNetworkServerAddresses, Array{server}}};
}

StoredService serviceNamed(const std::string& id, bool isStored = true) {
    StoredService service;
    service.id = id;
    service.device = id;
    service.protocols = defaultProtocols();
    service.isStored = isStored;
    return service;
}

// What is stored, and what was done with it, beyond the life of a connection.
struct Disk {
    std::optional<std::vector<StoredService>> services = {{serviceNamed("eth7"), serviceNamed("eth8")}};
    Outcome refusal;
    std::map<std::string, Outcome> failures; // of applying, by service
    std::vector<std::pair<std::string, IPv4Configuration>> applied;
    int stores = 0;
};

class MemoryBacking final : public Backing {
  public:
    explicit MemoryBacking(Disk& disk) : _disk(disk) {}

    std::optional<std::vector<StoredService>> load() override { return _disk.services; }

    Outcome store(std::vector<ChangedService>& changed) override {
        ++_disk.stores;
        if (!_disk.refusal) {
            return _disk.refusal;
        }
        for (ChangedService& each : changed) {
            Outcome outcome = each.service.rebase(_onDisk(each.service.id).protocols, each.configuration);
            if (!outcome) {
                return outcome;
            }
        }
        for (const ChangedService& each : changed) {
            _onDisk(each.service.id).protocols = each.service.protocols;
            _onDisk(each.service.id).isStored = true;
        }
        return {};
    }

    Outcome apply(const StoredService& service, const IPv4Configuration& configuration) override {
        const auto failure = _disk.failures.find(service.id);
        if (failure != _disk.failures.end()) {
            return failure->second;
        }
        _disk.applied.emplace_back(service.id, configuration);
        return {platform::kNetworkConfigSuccess, service.id};
    }

  private:
    StoredService& _onDisk(const std::string& id) {
        return *std::ranges::find(*_disk.services, id, &StoredService::id);
    }

    Disk& _disk;
};

class StoredConfigurationTest : public testing::Test {
  protected:
    std::shared_ptr<platform::NetworkConfigConnection> open() {
        return openStoredConfiguration([this]() -> std::unique_ptr<Backing> {
            return isReachable ? std::make_unique<MemoryBacking>(disk) : nullptr;
        });
    }
    static std::shared_ptr<platform::NetworkService> service(platform::NetworkConfigConnection& connection,
                                                             std::size_t index = 0) {
        return connection.copyCurrentSet()->copyServices()->at(index);
    }
    static std::shared_ptr<platform::NetworkProtocol> ipv4(platform::NetworkConfigConnection& connection,
                                                           std::size_t index = 0) {
        return service(connection, index)->copyProtocol(kIPv4);
    }
    std::vector<std::string> applied() const {
        std::vector<std::string> ids;
        for (const auto& [id, configuration] : disk.applied) {
            ids.push_back(id);
        }
        return ids;
    }
    const Protocols& onDisk(std::size_t index = 0) const { return disk.services->at(index).protocols; }

    Disk disk;
    bool isReachable = true;
};

TEST_F(StoredConfigurationTest, WithoutABackingThereIsNoConnection) {
    isReachable = false;
    EXPECT_EQ(open(), nullptr);
}

TEST_F(StoredConfigurationTest, WhatIsConfiguredIsAppliedOnceItIsCommittedAsItWasThen) {
    const auto connection = open();
    EXPECT_TRUE(ipv4(*connection)->setConfiguration(manual("192.0.2.7")));
    EXPECT_TRUE(connection->applyChanges());
    EXPECT_TRUE(disk.applied.empty());
    EXPECT_TRUE(connection->commitChanges());
    EXPECT_TRUE(ipv4(*connection)->setConfiguration(manual("192.0.2.8"))); // not committed
    EXPECT_TRUE(connection->applyChanges());
    EXPECT_EQ(connection->lastErrorText(), "no error");
    EXPECT_TRUE(connection->applyChanges()); // nothing is left to do
    ASSERT_EQ(applied(), (std::vector<std::string>{"eth7"}));
    EXPECT_EQ(disk.applied.front().second.address, 0xC0000207U);
}

TEST_F(StoredConfigurationTest, WhatIsMerelyEnabledAddedOrEstablishedIsStoredAndNotApplied) {
    disk.services->push_back(serviceNamed("eth9", false));
    const auto connection = open();
    EXPECT_TRUE(service(*connection)->setEnabled(true));
    EXPECT_TRUE(service(*connection, 1)->addProtocolType("One"));
    EXPECT_TRUE(connection->copyCurrentSet()->establishDefaultConfiguration());
    EXPECT_TRUE(connection->commitChanges());
    EXPECT_TRUE(connection->applyChanges());
    EXPECT_TRUE(disk.applied.empty());
    EXPECT_TRUE(onDisk(1).contains("One"));
    EXPECT_TRUE(disk.services->at(2).isStored);
    EXPECT_FALSE(connection->copyCurrentSet()->establishDefaultConfiguration());
}

TEST_F(StoredConfigurationTest, HardwareThatHasComeSinceIsEstablished) {
    const auto connection = open();
    EXPECT_FALSE(connection->copyCurrentSet()->establishDefaultConfiguration());
    disk.services->push_back(serviceNamed("eth9", false));
    EXPECT_TRUE(connection->copyCurrentSet()->establishDefaultConfiguration());
    EXPECT_FALSE(connection->copyCurrentSet()->establishDefaultConfiguration());
    EXPECT_EQ(connection->copyCurrentSet()->copyServices()->size(), 3U);
}

TEST_F(StoredConfigurationTest, WhatIsRefusedIsStillAChange) {
    const auto connection = open();
    ipv4(*connection)->setConfiguration(manual("192.0.2.7"));
    disk.refusal = {platform::kNetworkConfigInUse, "why"};
    EXPECT_FALSE(connection->commitChanges());
    EXPECT_EQ(connection->lastErrorCode(), platform::kNetworkConfigInUse);
    EXPECT_EQ(connection->lastErrorText(),
              platform::networkConfigStatusText(platform::kNetworkConfigInUse) + " (why)");
    EXPECT_TRUE(connection->applyChanges());
    EXPECT_TRUE(disk.applied.empty());
    disk.refusal = {};
    EXPECT_TRUE(connection->commitChanges());
    EXPECT_EQ(onDisk().at(kIPv4), manual("192.0.2.7"));
}

TEST_F(StoredConfigurationTest, WhatMakesNoSenseIsRefusedAndNamed) {
    const auto connection = open();
    EXPECT_TRUE(ipv4(*connection)->setConfiguration(manual("192.0.2.255")));
    EXPECT_FALSE(connection->commitChanges());
    EXPECT_EQ(connection->lastErrorCode(), platform::kNetworkConfigInvalid);
    EXPECT_NE(connection->lastErrorText().find("(eth7: address 192.0.2.255/24)"), std::string::npos);
    EXPECT_EQ(onDisk(), defaultProtocols());
}

TEST_F(StoredConfigurationTest, WhatCannotBeAppliedIsTriedAgainAndTheFirstErrorCounts) {
    const auto connection = open();
    ipv4(*connection)->setConfiguration(bootP());
    ipv4(*connection, 1)->setConfiguration(bootP());
    disk.services->push_back(serviceNamed("eth9"));
    EXPECT_TRUE(connection->commitChanges());
    disk.failures = {{"eth7", {platform::kNetworkConfigNoDevice, "one"}},
                     {"eth8", {platform::kNetworkConfigNoDHCPClient, "two"}}};
    EXPECT_FALSE(connection->applyChanges());
    EXPECT_EQ(connection->lastErrorCode(), platform::kNetworkConfigNoDevice);
    disk.failures.erase("eth8");
    EXPECT_FALSE(connection->applyChanges());
    EXPECT_EQ(applied(), (std::vector<std::string>{"eth8"}));
    disk.failures.clear();
    EXPECT_TRUE(connection->applyChanges());
    EXPECT_EQ(applied(), (std::vector<std::string>{"eth8", "eth7"}));
}

TEST_F(StoredConfigurationTest, SynchronizingDropsChangesAndSeesWhatOthersStored) {
    const auto connection = open();
    const auto protocol = ipv4(*connection);
    protocol->setConfiguration(bootP());
    disk.services->front().protocols[kIPv4] = manual("192.0.2.9");
    connection->synchronize();
    EXPECT_EQ(protocol->configuration(), manual("192.0.2.9"));
    disk.services->erase(disk.services->begin());
    isReachable = false; // what was read through before is asked again
    connection->synchronize();
    EXPECT_EQ(protocol->configuration(), std::nullopt);
    EXPECT_FALSE(protocol->setConfiguration(bootP()));
    EXPECT_EQ(protocol->lastErrorCode(), platform::kNetworkConfigNotFound);
}

TEST_F(StoredConfigurationTest, WithoutASetThereAreNoServices) {
    const auto connection = open();
    const auto set = connection->copyCurrentSet();
    disk.services.reset();
    connection->synchronize();
    EXPECT_EQ(connection->copyCurrentSet(), nullptr);
    EXPECT_EQ(set->copyServices(), std::nullopt);
    EXPECT_EQ(set->lastErrorCode(), platform::kNetworkConfigNotFound);
    EXPECT_FALSE(set->establishDefaultConfiguration());
}

TEST_F(StoredConfigurationTest, AServiceThatWasCommittedAndIsGoneCannotBeApplied) {
    const auto connection = open();
    ipv4(*connection)->setConfiguration(bootP());
    EXPECT_TRUE(connection->commitChanges());
    disk.services->erase(disk.services->begin());
    connection->synchronize();
    EXPECT_FALSE(connection->applyChanges());
    EXPECT_EQ(connection->lastErrorCode(), platform::kNetworkConfigNotFound);
}

// Rebasing

TEST_F(StoredConfigurationTest, ChangesAreMadeToWhatIsStoredByThen) {
    const auto first = open();
    const auto second = open();
    ipv4(*first)->setConfiguration(manual("192.0.2.7"));
    service(*second)->copyProtocol(kDNS)->setConfiguration(servers("192.0.2.53"));
    EXPECT_TRUE(first->commitChanges());
    EXPECT_TRUE(second->commitChanges());
    EXPECT_EQ(onDisk(), (Protocols{{kIPv4, manual("192.0.2.7")}, {kDNS, servers("192.0.2.53")}}));
    ASSERT_TRUE(second->applyChanges());
    EXPECT_EQ(disk.applied.back().second.address, 0xC0000207U); // that of the first, whole
}

TEST_F(StoredConfigurationTest, WhatIsStoredAndMakesNoSenseIsPassedOver) {
    disk.services->front().protocols = {{kIPv4, manual("nonsense")}, {kDNS, servers("nonsense")}};
    const auto connection = open();
    ipv4(*connection)->setConfiguration(manual("192.0.2.7"));
    ASSERT_TRUE(connection->commitChanges()) << connection->lastErrorText();
    ASSERT_TRUE(connection->applyChanges());
    EXPECT_TRUE(disk.applied.back().second.servers.empty());
    disk.services->back().protocols = {{kIPv4, manual("nonsense")}, {kDNS, std::nullopt}};
    connection->synchronize();
    service(*connection, 1)->copyProtocol(kDNS)->setConfiguration(servers("192.0.2.53"));
    ASSERT_TRUE(connection->commitChanges()) << connection->lastErrorText();
    ASSERT_TRUE(connection->applyChanges());
    EXPECT_EQ(disk.applied.back().second.method, IPv4Configuration::Method::Unset);
    EXPECT_EQ(disk.applied.back().second.servers, (std::vector<std::string>{"192.0.2.53"}));
}

TEST_F(StoredConfigurationTest, AProtocolThatOthersAddedAndConfiguredMeanwhileStaysAsItIs) {
    const auto connection = open();
    EXPECT_TRUE(service(*connection)->addProtocolType("One"));
    disk.services->front().protocols["One"] = bootP();
    EXPECT_TRUE(connection->commitChanges());
    EXPECT_EQ(onDisk().at("One"), bootP());
}

} // namespace
} // namespace welcomer::network
