// The configuration that is stored, and committing it.

#include "tests/unit/network/NetworkingManagerApplyFixture.h"

#include <cstdint>
#include <utility>

namespace welcomer {
namespace {

// The IPv4 configuration

TEST_F(ApplyTest, EachMethodSetsItsOwnKeysAndLeavesTheOthersInPlace) {
    const Dictionary earlier = {{"ConfigMethod", "Manual"},
                                {"Addresses", Array{"10.0.0.1", "10.0.0.2"}},
                                {"SubnetMasks", Array{"255.0.0.0"}},
                                {"Router", "10.0.0.254"},
                                {"Other", 1}};
    const auto changed = [&](Dictionary changes) {
        Dictionary all = earlier;
        for (auto& [key, value] : changes) {
            all.insert_or_assign(key, value);
        }
        return all;
    };
    const std::vector<std::pair<std::string, Dictionary>> kCases = {
        {"Manual", changed({{"Addresses", Array{"192.0.2.7"}},
                            {"SubnetMasks", Array{"255.255.255.0"}},
                            {"Router", "192.0.2.1"}})},
        {"Manual DHCP", changed({{"ConfigMethod", "INFORM"}, {"Addresses", Array{"192.0.2.7"}}})},
        {"DHCP", changed({{"ConfigMethod", "DHCP"}, {"DHCPClientID", "me"}})},
        {"BootP", changed({{"ConfigMethod", "BOOTP"}})},
    };
    for (const auto& [method, expected] : kCases) {
        store.services[0].protocols = {{"IPv4", earlier}};
        NetworkingManager& made = manualManager();
        made.setDhcpClientID("me");
        made.setConfigurationMethod(method);
        EXPECT_TRUE(made.configureManual());
        EXPECT_EQ(stored(0, "IPv4"), expected) << method;
        EXPECT_EQ(logged(), Lines());
    }
}

TEST_F(ApplyTest, TheDHCPClientIDIsWrittenOnlyWhenItIsSet) {
    NetworkingManager& made = manualManager();
    made.setConfigurationMethod("DHCP");
    EXPECT_TRUE(made.configureManual());
    EXPECT_EQ(stored(0, "IPv4"), (Dictionary{{"ConfigMethod", "DHCP"}}));
    made.setDhcpClientID("");
    EXPECT_TRUE(made.configureManual());
    EXPECT_EQ(stored(0, "IPv4"), (Dictionary{{"ConfigMethod", "DHCP"}, {"DHCPClientID", ""}}));
}

TEST_F(ApplyTest, AnUnknownOrMissingMethodIsDHCPWithALogLine) {
    for (const NetworkingManager::Text& method :
         {NetworkingManager::Text(), NetworkingManager::Text("manual"), NetworkingManager::Text("INFORM"),
          NetworkingManager::Text("BOOTP"), NetworkingManager::Text("")}) {
        NetworkingManager& made = manualManager();
        made.setConfigurationMethod(method);
        EXPECT_TRUE(made.configureManual());
        EXPECT_EQ(logged(), (Lines{"NetworkingManager: no TCPConfigureMethod specified, assuming DHCP"}));
        EXPECT_EQ(stored(0, "IPv4"), (Dictionary{{"ConfigMethod", "DHCP"}}));
    }
}

TEST_F(ApplyTest, WhatIsStoredIsStoredAsItStands) {
    NetworkingManager& made = manualManager();
    made.setIpAddress("no address");
    made.setSubnetMask("255.0.255.0");
    made.setRouter("");
    EXPECT_TRUE(made.configureManual());
    EXPECT_EQ(stored(0, "IPv4"), (Dictionary{{"ConfigMethod", "Manual"},
                                             {"Addresses", Array{"no address"}},
                                             {"SubnetMasks", Array{"255.0.255.0"}},
                                             {"Router", ""}}));
}

TEST_F(ApplyTest, AManualSettingThatIsNoneFailsWithNothingCommitted) {
    for (int missing = 0; missing < 3; ++missing) {
        NetworkingManager& made = manualManager();
        missing == 0 ? made.setIpAddress(std::nullopt)
                     : (missing == 1 ? made.setSubnetMask(std::nullopt) : made.setRouter(std::nullopt));
        EXPECT_FALSE(made.configureManual());
        EXPECT_EQ(fake.recorder.callsTo(kStore + "setConfiguration"), Lines());
        EXPECT_EQ(fake.recorder.callsTo(kStore + "commit"), Lines());
    }
    NetworkingManager& made = manualManager();
    made.setConfigurationMethod("Manual DHCP");
    made.setIpAddress(std::nullopt);
    EXPECT_FALSE(made.configureManual());
    EXPECT_EQ(fake.recorder.callsTo(kStore + "commit"), Lines());
}

TEST_F(ApplyTest, AServiceWithoutAnIPv4OrADNSProtocolFailsWithNothingCommitted) {
    store.failures["addProtocolType"] = {7};
    EXPECT_FALSE(manualManager().configureManual());
    EXPECT_EQ(logged(), (Lines{"Error 7 from NCNetworkServiceAddProtocolType"}));
    EXPECT_EQ(fake.recorder.callsTo(kStore + "commit"), Lines());

    store.failures["addProtocolType"] = {0, 1}; // the DNS protocol
    EXPECT_FALSE(manualManager().configureManual());
    EXPECT_EQ(logged(), (Lines{"Error 0 from NCNetworkServiceAddProtocolType"}));
    EXPECT_EQ(fake.recorder.callsTo(kStore + "commit"), Lines());
}

TEST_F(ApplyTest, AConfigurationThatCannotBeSetIsLoggedAndTheRestFollows) {
    for (const std::int32_t code : {0, -7}) {
        store.failures["setConfiguration"] = {code, 0, 1};
        NetworkingManager& made = manualManager();
        made.setDns(Lines{"192.0.2.53"});
        EXPECT_TRUE(made.configureManual());
        EXPECT_EQ(logged(), (Lines{"NetworkingManager: NCNetworkProtocolSetConfiguration failed error code " +
                                   std::to_string(code) + " error text of " + std::to_string(code)}));
        EXPECT_EQ(stored(0, "DNS"), (Dictionary{{"ServerAddresses", Array{"192.0.2.53"}}}));
    }
}

// The DNS configuration

TEST_F(ApplyTest, LeadingSpacesGoTrailingOnesStayAndNoAddressIsDropped) {
    const std::vector<std::pair<Lines, Array>> kCases = {
        {{"  192.0.2.1", "0.0.0.0"}, {"192.0.2.1"}},
        {{"192.0.2.1  "}, {"192.0.2.1  "}},
        {{"", "   ", "192.0.2.1"}, {"192.0.2.1"}},
        {{" 0.0.0.0", "0.0.0.0 "}, {"0.0.0.0 "}},
        {{"\t192.0.2.1"}, {"\t192.0.2.1"}},
        {{"no address", "192.0.2.2", "192.0.2.2"}, {"no address", "192.0.2.2", "192.0.2.2"}},
    };
    for (const auto& [given, kept] : kCases) {
        NetworkingManager& made = manualManager();
        made.setDns(given);
        EXPECT_TRUE(made.configureManual());
        EXPECT_EQ(stored(0, "DNS"), (Dictionary{{"ServerAddresses", kept}}));
        EXPECT_EQ(logged(), Lines());
    }
}

TEST_F(ApplyTest, AnEntryThatIsNoTextIsLoggedAndSkipped) {
    NetworkingManager& made = manualManager();
    made.setDns(Lines{" \xff", "192.0.2.1"});
    EXPECT_TRUE(made.configureManual());
    EXPECT_EQ(stored(0, "DNS"), (Dictionary{{"ServerAddresses", Array{"192.0.2.1"}}}));
    EXPECT_EQ(logged(), (Lines{"*** _setManualDNS bad DNS  \xff"}));
}

TEST_F(ApplyTest, WithoutAServerTheDNSConfigurationIsLeftUntouched) {
    const Dictionary earlier = {{"ServerAddresses", Array{"198.51.100.1"}}};
    for (const NetworkingManager::TextList& given :
         {NetworkingManager::TextList(), NetworkingManager::TextList(Lines{}),
          NetworkingManager::TextList(Lines{" ", "0.0.0.0"})}) {
        store.services[0].protocols = {{"DNS", earlier}};
        NetworkingManager& made = manualManager();
        made.setDns(given);
        made.setSearchDomains(Lines{"home.example"});
        EXPECT_TRUE(made.configureManual());
        EXPECT_EQ(stored(0, "DNS"), earlier);
        EXPECT_EQ(fake.recorder.callsTo(kStore + "setConfiguration").size(), 1U); // the IPv4 one
    }
}

TEST_F(ApplyTest, SearchDomainsAreNeverWritten) {
    store.services[0].protocols = {{"DNS", Dictionary{{"DomainName", "kept.example"}}}};
    NetworkingManager& made = manualManager();
    made.setDns(Lines{"192.0.2.1"});
    made.setSearchDomains(Lines{"home.example"});
    EXPECT_TRUE(made.configureManual());
    EXPECT_EQ(stored(0, "DNS"),
              (Dictionary{{"DomainName", "kept.example"}, {"ServerAddresses", Array{"192.0.2.1"}}}));
}

TEST_F(ApplyTest, ADNSConfigurationThatCannotBeSetIsLoggedAndCommittedAllTheSame) {
    for (const std::int32_t code : {0, 7}) {
        store.failures["setConfiguration"] = {code, 1, 1};
        NetworkingManager& made = manualManager();
        made.setDns(Lines{"192.0.2.1"});
        EXPECT_TRUE(made.configureManual());
        EXPECT_EQ(logged(),
                  (Lines{"Error " + std::to_string(code) + " from NCNetworkProtocolSetConfiguration"}));
        EXPECT_EQ(fake.recorder.callsTo(kStore + "commit").size(), 1U);
    }
}

TEST_F(ApplyTest, TenThousandServersAreAllStored) {
    NetworkingManager& made = manualManager();
    made.setDns(Lines(10000, " 192.0.2.1"));
    EXPECT_TRUE(made.configureManual());
    EXPECT_EQ(stored(0, "DNS"), (Dictionary{{"ServerAddresses", Array(10000, "192.0.2.1")}}));
}

// Committing

TEST_F(ApplyTest, ACommitThatFailsIsUndoneAndNotApplied) {
    NetworkingManager& made = openManager();
    store.failures["commit"] = {-7};
    EXPECT_FALSE(made.commitPrefs());
    EXPECT_EQ(writes(), (Lines{"commit", "synchronize"}));
    EXPECT_EQ(logged(),
              (Lines{"NetworkingManager: NCPreferencesCommitChanges failed error code -7 error text of -7"}));
}

TEST_F(ApplyTest, ACommitThatFailsIsLoggedBeforeItIsUndone) {
    NetworkingManager& made = openManager();
    store.failures["commit"] = {-7};
    EXPECT_FALSE(made.commitPrefs());
    EXPECT_EQ(fake.recorder.calls().back(), kStore + "synchronize");
}

TEST_F(ApplyTest, ACommitThatFailsWithoutACodeCountsAsSuccess) {
    NetworkingManager& made = openManager();
    store.failures["commit"] = {0};
    EXPECT_TRUE(made.commitPrefs());
    EXPECT_EQ(writes(), (Lines{"commit", "synchronize"}));
    EXPECT_EQ(logged(),
              (Lines{"NetworkingManager: NCPreferencesCommitChanges failed error code 0 error text of 0"}));
}

TEST_F(ApplyTest, AnApplyThatFailsIsAFailureUnlessItHasNoCode) {
    NetworkingManager& made = openManager();
    for (const std::int32_t code : {0, 7}) {
        store.failures["apply"] = {code};
        EXPECT_EQ(made.commitPrefs(), code == 0);
        const std::string text = std::to_string(code);
        EXPECT_EQ(logged(), (Lines{"NetworkingManager: NCPreferencesApplyChanges failed error code " + text +
                                   " error text of " + text}));
    }
    EXPECT_EQ(writes(), (Lines{"commit", "apply", "commit", "apply"}));
}

TEST_F(ApplyTest, ASuccessfulCommitIsSilent) {
    EXPECT_TRUE(openManager().commitPrefs());
    EXPECT_EQ(logged(), Lines());
}

} // namespace
} // namespace welcomer
