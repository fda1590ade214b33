#include "network/NCUtils.h"

#include "log/PCLogManager.h"
#include "tests/fakes/FakePlatform.h"

#include <gtest/gtest.h>

#include <optional>
#include <string>
#include <utility>
#include <vector>

namespace welcomer {
namespace {

using Lines = std::vector<std::string>;
using fakes::FakeInterface;
using fakes::FakeService;
using platform::kNetworkEthernet;

const FakeInterface kEthernet = {"Ethernet", "eth0", "Ethernet (eth0)"};
const FakeInterface kBridge = {"Bridge", "br0", "Bridge (br0)"};
const FakeInterface kWireless = {"Wireless", "wlan0", "Wireless (wlan0)"};

FakeService service(const std::string& name, const std::string& id,
                    fakes::FakeInterfaceChain chain = {kEthernet}) {
    FakeService made;
    made.name = name;
    made.id = id;
    made.chain = std::move(chain);
    return made;
}

class NCUtilsTest : public testing::Test {
  protected:
    std::shared_ptr<platform::NetworkSet> set() {
        return fake.networkConfigStore.open("a test")->copyCurrentSet();
    }
    std::shared_ptr<platform::NetworkService> serviceAt(std::size_t index) {
        return set()->copyServices()->at(index);
    }
    static std::optional<std::string> idOf(const std::shared_ptr<platform::NetworkService>& found) {
        return found ? found->serviceID() : std::nullopt;
    }
    static std::optional<Lines> idsOf(const std::optional<NCUtils::Services>& found) {
        if (!found) {
            return std::nullopt;
        }
        Lines ids;
        for (const auto& each : *found) {
            ids.push_back(idOf(each).value_or("none"));
        }
        return ids;
    }
    Lines logged() { return fake.systemLog.lines(); }

    fakes::FakePlatform fake;
    const platform::ScopedPlatform installed{fake.platform()};
    std::vector<FakeService>& services = fake.networkConfigStore.services;
};

// Finding services

TEST_F(NCUtilsTest, AServiceIsFoundByItsName) {
    services = {service("Wired", "1"), service("Other", "2")};
    EXPECT_EQ(idOf(NCUtils::serviceInSetWithName(set().get(), "Other")), "2");
    EXPECT_EQ(idOf(NCUtils::serviceInSetWithName(set().get(), "other")), std::nullopt);
    EXPECT_EQ(idOf(NCUtils::serviceInSetWithName(set().get(), "Absent")), std::nullopt);
}

TEST_F(NCUtilsTest, OfTwoServicesWithOneNameTheFirstListedIsFound) {
    services = {service("Wired", "1"), service("Same", "2"), service("Same", "3")};
    EXPECT_EQ(idOf(NCUtils::serviceInSetWithName(set().get(), "Same")), "2");
}

TEST_F(NCUtilsTest, NoNameFindsNothingNotEvenAServiceWithoutOne) {
    services = {service("Wired", "1")};
    services[0].name = std::nullopt;
    EXPECT_EQ(NCUtils::serviceInSetWithName(set().get(), std::nullopt), nullptr);
}

TEST_F(NCUtilsTest, AnEmptySetHasAnEmptyListForAHardwareKeyAndNoFirstService) {
    EXPECT_EQ(idsOf(NCUtils::servicesInSetWithHardwareKey(set().get(), kNetworkEthernet)), Lines());
    EXPECT_EQ(NCUtils::serviceInSetWithHardwareKey(set().get(), kNetworkEthernet), nullptr);
}

TEST_F(NCUtilsTest, ServicesThatCannotBeListedAreNone) {
    services = {service("Wired", "1")};
    fake.networkConfigStore.cannotListServices = true;
    EXPECT_EQ(idsOf(NCUtils::servicesInSetWithHardwareKey(set().get(), kNetworkEthernet)), std::nullopt);
    EXPECT_EQ(NCUtils::serviceInSetWithHardwareKey(set().get(), kNetworkEthernet), nullptr);
    EXPECT_EQ(NCUtils::serviceInSetWithName(set().get(), "Wired"), nullptr);
}

TEST_F(NCUtilsTest, NoSetAndNoKeyFindNothing) {
    services = {service("Wired", "1")};
    EXPECT_EQ(idsOf(NCUtils::servicesInSetWithHardwareKey(nullptr, kNetworkEthernet)), std::nullopt);
    EXPECT_EQ(idsOf(NCUtils::servicesInSetWithHardwareKey(set().get(), std::nullopt)), std::nullopt);
    EXPECT_EQ(NCUtils::serviceInSetWithHardwareKey(set().get(), std::nullopt), nullptr);
    EXPECT_EQ(NCUtils::serviceInSetWithName(nullptr, "Wired"), nullptr);
}

TEST_F(NCUtilsTest, AnEmptyNameAndAnEmptyKeyFindNothing) {
    services = {service("", "1", {{"", "eth0", "Port without a type"}})};
    EXPECT_EQ(NCUtils::serviceInSetWithName(set().get(), ""), nullptr);
    EXPECT_EQ(idsOf(NCUtils::servicesInSetWithHardwareKey(set().get(), "")), std::nullopt);
    EXPECT_EQ(NCUtils::serviceInSetWithHardwareKey(set().get(), ""), nullptr);
}

TEST_F(NCUtilsTest, ServicesAreFoundByTheTypeOfAnyInterfaceOfTheirChainInTheSetsOrder) {
    services = {service("Radio", "1", {kWireless}), service("Bridge", "2", {kBridge, kEthernet}),
                service("Nothing", "3", {}), service("Wired", "4")};
    EXPECT_EQ(idsOf(NCUtils::servicesInSetWithHardwareKey(set().get(), kNetworkEthernet)), (Lines{"2", "4"}));
    EXPECT_EQ(idOf(NCUtils::serviceInSetWithHardwareKey(set().get(), kNetworkEthernet)), "2");
    EXPECT_EQ(idsOf(NCUtils::servicesInSetWithHardwareKey(set().get(), "Wireless")), (Lines{"1"}));
    EXPECT_EQ(idsOf(NCUtils::servicesInSetWithHardwareKey(set().get(), "Token ring")), Lines());
}

TEST_F(NCUtilsTest, AServiceWithTwoMatchingInterfacesIsListedOnce) {
    services = {service("Stack", "1", {kEthernet, kBridge, kEthernet})};
    EXPECT_EQ(idsOf(NCUtils::servicesInSetWithHardwareKey(set().get(), kNetworkEthernet)), (Lines{"1"}));
}

TEST_F(NCUtilsTest, AServiceIsFoundByItsIDExactly) {
    services = {service("A", "id"), service("B", "ID"), service("C", "ID")};
    const auto list = set()->copyServices();
    EXPECT_EQ(NCUtils::serviceInArrayWithID(list, "ID"), list->at(1).get());
    EXPECT_EQ(NCUtils::serviceInArrayWithID(list, "Id"), nullptr);
}

TEST_F(NCUtilsTest, NoListAnEmptyListNoIDAndAnEmptyIDFindNothing) {
    services = {service("A", "")};
    const auto list = set()->copyServices();
    EXPECT_EQ(NCUtils::serviceInArrayWithID(std::nullopt, "id"), nullptr);
    EXPECT_EQ(NCUtils::serviceInArrayWithID(NCUtils::Services(), "id"), nullptr);
    EXPECT_EQ(NCUtils::serviceInArrayWithID(list, std::nullopt), nullptr);
    EXPECT_EQ(NCUtils::serviceInArrayWithID(list, ""), nullptr);
    EXPECT_EQ(NCUtils::serviceInArrayWithID(NCUtils::Services{nullptr}, "id"), nullptr);
}

TEST_F(NCUtilsTest, TheFirstInterfaceOfATypeInTheChainIsFound) {
    services = {service("Stack", "1", {kBridge, kEthernet, {"Ethernet", "eth9", "far"}}),
                service("None", "2", {})};
    const auto stacked = serviceAt(0);
    EXPECT_EQ(NCUtils::interfaceInServiceWithType(stacked.get(), "Ethernet"),
              stacked->interface()->underlyingInterface());
    EXPECT_EQ(NCUtils::interfaceInServiceWithType(stacked.get(), "Bridge"), stacked->interface());
    EXPECT_EQ(NCUtils::interfaceInServiceWithType(stacked.get(), "Wireless"), nullptr);
    EXPECT_EQ(NCUtils::interfaceInServiceWithType(serviceAt(1).get(), "Ethernet"), nullptr);
    EXPECT_EQ(NCUtils::interfaceInServiceWithType(nullptr, "Ethernet"), nullptr);
}

// Protocols

TEST_F(NCUtilsTest, AProtocolThatIsThereIsGivenWithoutAddingOne) {
    services = {service("Wired", "1")};
    services[0].protocols = {{"IPv4", PropertyList::Dictionary{{"a", 1}}}};
    const auto protocol = NCUtils::createOrGetProtocolForService("IPv4", serviceAt(0).get());
    ASSERT_NE(protocol, nullptr);
    EXPECT_EQ(protocol->configuration(), (PropertyList::Dictionary{{"a", 1}}));
    EXPECT_EQ(fake.recorder.callsTo("NetworkConfigStore.addProtocolType"), Lines());
}

TEST_F(NCUtilsTest, AMissingProtocolIsAddedAndGiven) {
    services = {service("Wired", "1")};
    const auto protocol = NCUtils::createOrGetProtocolForService("DNS", serviceAt(0).get());
    ASSERT_NE(protocol, nullptr);
    EXPECT_EQ(protocol->type(), "DNS");
    EXPECT_EQ(protocol->configuration(), std::nullopt);
    EXPECT_EQ(logged(), Lines());
}

TEST_F(NCUtilsTest, AProtocolThatCannotBeAddedIsNoneAndLoggedWithTheStoresError) {
    services = {service("Wired", "1")};
    std::vector<std::pair<std::int32_t, std::string>> calls;
    PCLogManager::sharedManager().setObserver(
        [&](const PCLogManager::Call& call) { calls.emplace_back(call.type, call.function); });
    for (const std::int32_t code : {0, 7, -1004}) {
        fake.systemLog.clear();
        fake.networkConfigStore.failures["addProtocolType"] = {code};
        EXPECT_EQ(NCUtils::createOrGetProtocolForService("DNS", serviceAt(0).get()), nullptr);
        EXPECT_EQ(logged(),
                  (Lines{"Error " + std::to_string(code) + " from NCNetworkServiceAddProtocolType"}));
    }
    PCLogManager::sharedManager().setObserver({});
    EXPECT_EQ(calls.at(0),
              (std::pair<std::int32_t, std::string>{1, "+[NCUtils createOrGetProtocol:forService:]"}));
    EXPECT_EQ(NCUtils::createOrGetProtocolForService("DNS", nullptr), nullptr);
}

TEST_F(NCUtilsTest, AllProtocolsAreCopiedWithTheirConfigurations) {
    services = {service("From", "1"), service("To", "2")};
    services[0].protocols = {{"IPv4", PropertyList::Dictionary{{"a", 1}}}, {"DNS", std::nullopt}};
    NCUtils::copyProtocolsFromServiceToService(serviceAt(0).get(), serviceAt(1).get());
    EXPECT_EQ(services[1].protocols, services[0].protocols);
    EXPECT_EQ(fake.recorder.callsTo("NetworkConfigStore.setConfiguration").size(), 1U);
    EXPECT_EQ(logged(), Lines());
}

TEST_F(NCUtilsTest, AProtocolThatTheDestinationHasKeepsItsConfiguration) {
    services = {service("From", "1"), service("To", "2")};
    services[0].protocols = {{"IPv4", PropertyList::Dictionary{{"a", 1}}},
                             {"DNS", PropertyList::Dictionary()}};
    services[1].protocols = {{"IPv4", PropertyList::Dictionary{{"b", 2}}}};
    NCUtils::copyProtocolsFromServiceToService(serviceAt(0).get(), serviceAt(1).get());
    EXPECT_EQ(services[1].protocols,
              (std::vector<fakes::FakeProtocol>{{"IPv4", PropertyList::Dictionary{{"b", 2}}},
                                                {"DNS", PropertyList::Dictionary()}}));
    EXPECT_EQ(logged(), (Lines{"Could not create protocol of type IPv4"}));
}

TEST_F(NCUtilsTest, AbsentProtocolsAndThoseWithoutATypeAreSkipped) {
    services = {service("From", "1"), service("To", "2")};
    services[0].protocols = {{"IPv4", std::nullopt, true},
                             {std::nullopt, std::nullopt},
                             {"", std::nullopt},
                             {"DNS", std::nullopt}};
    NCUtils::copyProtocolsFromServiceToService(serviceAt(0).get(), serviceAt(1).get());
    EXPECT_EQ(services[1].protocols, (std::vector<fakes::FakeProtocol>{{"DNS", std::nullopt}}));
    EXPECT_EQ(logged(), Lines());
}

TEST_F(NCUtilsTest, AConfigurationThatCannotBeSetIsLoggedAndTheNextProtocolFollows) {
    services = {service("From", "1"), service("To", "2")};
    services[0].protocols = {{"IPv4", PropertyList::Dictionary{{"a", 1}}},
                             {"DNS", PropertyList::Dictionary()}};
    fake.networkConfigStore.failures["setConfiguration"] = {5, 0, 1};
    NCUtils::copyProtocolsFromServiceToService(serviceAt(0).get(), serviceAt(1).get());
    EXPECT_EQ(services[1].protocols, (std::vector<fakes::FakeProtocol>{{"IPv4", std::nullopt},
                                                                       {"DNS", PropertyList::Dictionary()}}));
    EXPECT_EQ(logged(), (Lines{"Could not set protocol configuration"}));
}

TEST_F(NCUtilsTest, NothingToCopyCopiesNothing) {
    services = {service("From", "1"), service("To", "2")};
    NCUtils::copyProtocolsFromServiceToService(serviceAt(0).get(), serviceAt(1).get());
    services[0].protocols = {{"DNS", std::nullopt}};
    fake.networkConfigStore.cannotListProtocols = true;
    NCUtils::copyProtocolsFromServiceToService(serviceAt(0).get(), serviceAt(1).get());
    NCUtils::copyProtocolsFromServiceToService(nullptr, serviceAt(1).get());
    NCUtils::copyProtocolsFromServiceToService(serviceAt(0).get(), nullptr);
    EXPECT_TRUE(services[1].protocols.empty());
    EXPECT_EQ(logged(), Lines());
}

} // namespace
} // namespace welcomer
