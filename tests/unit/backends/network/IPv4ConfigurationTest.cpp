#include "backends/network/IPv4Configuration.h"

#include "platform/NetworkConfigStore.h"

#include <gtest/gtest.h>

namespace welcomer::network {
namespace {

using Array = PropertyList::Array;
using Dictionary = PropertyList::Dictionary;
using Method = IPv4Configuration::Method;

Dictionary manual(const std::string& address, const std::string& mask, const std::string& router = "") {
    return {{platform::kNetworkConfigMethod, platform::kNetworkMethodManual},
            {platform::kNetworkAddresses, Array{address}},
            {platform::kNetworkSubnetMasks, Array{mask}},
            {platform::kNetworkRouter, router}};
}

Dictionary inform(const std::string& address) {
    return {{platform::kNetworkConfigMethod, platform::kNetworkMethodInform},
            {platform::kNetworkAddresses, Array{address}}};
}

Dictionary dnsWith(const Array& servers) {
    return {{platform::kNetworkServerAddresses, servers}};
}

std::int32_t statusOf(const Dictionary& ipv4) {
    return readIPv4Configuration(ipv4, std::nullopt).status;
}

// What is read of a configuration that must be a good one.
IPv4Configuration read(const std::optional<Dictionary>& ipv4,
                       const std::optional<Dictionary>& dns = std::nullopt) {
    const IPv4Reading reading = readIPv4Configuration(ipv4, dns);
    EXPECT_EQ(reading.status, platform::kNetworkConfigSuccess) << reading.detail;
    return reading.configuration;
}

TEST(IPv4ConfigurationTest, AManualOneSaysAll) {
    const IPv4Configuration configuration = read(manual("192.0.2.7", "255.255.255.128", "192.0.2.1"));
    EXPECT_EQ(configuration.method, Method::Manual);
    EXPECT_EQ(configuration.address, 0xC0000207U);
    EXPECT_EQ(configuration.prefixLength, 25);
    EXPECT_EQ(configuration.router, 0xC0000201U);
    EXPECT_EQ(read(manual("192.0.2.7", "255.255.255.0")).router, std::nullopt);
    Dictionary withoutRouter = manual("192.0.2.7", "255.255.255.0");
    withoutRouter.erase(platform::kNetworkRouter);
    EXPECT_EQ(read(withoutRouter), read(manual("192.0.2.7", "255.255.255.0")));
}

TEST(IPv4ConfigurationTest, OnlyWhatAMachineCanHaveIsAnAddress) {
    for (const char* text : {"", "abc", "192.0.2", "192.0.2.7 ", "0.0.0.0", "0.1.2.3", "127.0.0.1",
                             "127.9.9.9", "224.0.0.1", "239.255.255.250", "240.0.0.1", "255.255.255.255",
                             "192.0.2.0",      // the network
                             "192.0.2.255"}) { // its broadcast address
        EXPECT_EQ(statusOf(manual(text, "255.255.255.0")), platform::kNetworkConfigInvalid) << text;
    }
    EXPECT_EQ(statusOf(manual("192.0.3.255", "255.255.254.0")), platform::kNetworkConfigInvalid);
    EXPECT_EQ(statusOf(manual("192.0.3.0", "255.255.254.0")), platform::kNetworkConfigSuccess);
    EXPECT_EQ(statusOf(manual("126.255.255.254", "255.0.0.0")), platform::kNetworkConfigSuccess);
    EXPECT_EQ(statusOf(manual("223.255.255.254", "255.255.255.0")), platform::kNetworkConfigSuccess);
}

TEST(IPv4ConfigurationTest, TheSmallestNetworksHaveNoFirstAndLastAddress) {
    for (const char* text : {"192.0.2.0", "192.0.2.1", "192.0.2.255"}) {
        EXPECT_EQ(read(manual(text, "255.255.255.254")).prefixLength, 31) << text;
        EXPECT_EQ(read(manual(text, "255.255.255.255")).prefixLength, 32) << text;
    }
    EXPECT_EQ(read(manual("192.0.2.0", "255.255.255.254", "192.0.2.1")).router, 0xC0000201U);
    EXPECT_EQ(statusOf(manual("192.0.2.0", "255.255.255.252")), platform::kNetworkConfigInvalid);
}

TEST(IPv4ConfigurationTest, OnlyOnesBeforeZerosAreAMask) {
    for (const char* text : {"", "0.0.0.0", "255.0.255.0", "24", "nonsense"}) {
        EXPECT_EQ(statusOf(manual("192.0.2.7", text)), platform::kNetworkConfigInvalid) << text;
    }
    Dictionary without = manual("192.0.2.7", "");
    without.erase(platform::kNetworkSubnetMasks);
    EXPECT_EQ(statusOf(without), platform::kNetworkConfigInvalid);
}

TEST(IPv4ConfigurationTest, ARouterIsAnotherMachineOnTheNetwork) {
    for (const char* text :
         {"nonsense", "0.0.0.0", "192.0.3.1", "192.0.2.0", "192.0.2.255", "192.0.2.7", " "}) {
        EXPECT_EQ(statusOf(manual("192.0.2.7", "255.255.255.0", text)), platform::kNetworkConfigInvalid)
            << text;
    }
    EXPECT_EQ(statusOf(manual("10.9.0.5", "255.255.255.255", "10.9.0.1")), platform::kNetworkConfigInvalid);
    Dictionary noText = manual("192.0.2.7", "255.255.255.0");
    noText[platform::kNetworkRouter] = 7;
    EXPECT_EQ(statusOf(noText), platform::kNetworkConfigInvalid);
}

TEST(IPv4ConfigurationTest, InformWithoutAMaskHasTheNetworkOfItsClass) {
    EXPECT_EQ(read(inform("10.9.0.5")).prefixLength, 8);
    EXPECT_EQ(read(inform("126.255.0.1")).prefixLength, 8);
    EXPECT_EQ(read(inform("128.0.0.1")).prefixLength, 16);
    EXPECT_EQ(read(inform("191.255.0.1")).prefixLength, 16);
    EXPECT_EQ(read(inform("192.0.2.7")).prefixLength, 24);
    EXPECT_EQ(read(inform("192.0.2.7")).router, std::nullopt);
}

TEST(IPv4ConfigurationTest, InformTakesWhatAnEarlierManualLeft) {
    Dictionary ipv4 = manual("192.0.2.7", "255.255.255.128", "192.0.2.1");
    ipv4[platform::kNetworkConfigMethod] = platform::kNetworkMethodInform;
    EXPECT_EQ(read(ipv4).prefixLength, 25);
    EXPECT_EQ(read(ipv4).router, 0xC0000201U);
    ipv4[platform::kNetworkAddresses] = Array{"192.0.2.130"};
    EXPECT_EQ(read(ipv4).prefixLength, 25);
    EXPECT_EQ(read(ipv4).router, std::nullopt); // it is on another network
    ipv4[platform::kNetworkAddresses] = Array{"192.0.2.128"};
    EXPECT_EQ(statusOf(ipv4), platform::kNetworkConfigInvalid);
    ipv4[platform::kNetworkSubnetMasks] = Array{"nonsense"};
    ipv4[platform::kNetworkRouter] = "nonsense";
    EXPECT_EQ(read(ipv4).prefixLength, 24);
    EXPECT_EQ(read(ipv4).router, std::nullopt);
}

TEST(IPv4ConfigurationTest, OtherMethodsTakeTheirOwnKeysAlone) {
    Dictionary ipv4 = manual("nonsense", "nonsense", "nonsense");
    ipv4[platform::kNetworkDHCPClientID] = "a client";
    const auto readAs = [&ipv4](const char* method) {
        ipv4[platform::kNetworkConfigMethod] = method;
        return read(ipv4);
    };
    IPv4Configuration expected;
    expected.method = Method::BootP;
    EXPECT_EQ(readAs(platform::kNetworkMethodBootP), expected);
    expected.method = Method::LinkLocal;
    EXPECT_EQ(readAs(platform::kNetworkMethodLinkLocal), expected);
    expected.method = Method::DHCP;
    expected.clientID = "a client";
    EXPECT_EQ(readAs(platform::kNetworkMethodDHCP), expected);
    ipv4.erase(platform::kNetworkConfigMethod);
    EXPECT_EQ(read(ipv4), IPv4Configuration());
    EXPECT_EQ(read(std::nullopt), IPv4Configuration());
}

TEST(IPv4ConfigurationTest, AnUnknownMethodIsRefusedAsSuch) {
    for (const PropertyList& method : {PropertyList("dhcp"), PropertyList(""), PropertyList(7)}) {
        EXPECT_EQ(statusOf({{platform::kNetworkConfigMethod, method}}),
                  platform::kNetworkConfigUnknownMethod);
    }
}

TEST(IPv4ConfigurationTest, NameServersAreAddressesWithBlanksBehindThem) {
    const IPv4Configuration configuration =
        read(std::nullopt, dnsWith({"192.0.2.53  ", "2001:db8::1", "fe80::1%eth0"}));
    EXPECT_EQ(configuration.servers, (std::vector<std::string>{"192.0.2.53", "2001:db8::1", "fe80::1%eth0"}));
    EXPECT_EQ(configuration.method, Method::Unset);
    EXPECT_TRUE(read(std::nullopt, dnsWith({})).servers.empty());
    EXPECT_TRUE(
        read(std::nullopt, Dictionary{{platform::kNetworkServerAddresses, "192.0.2.53"}}).servers.empty());
    for (const PropertyList& server : {PropertyList("nonsense"), PropertyList(" 192.0.2.53"),
                                       PropertyList(""), PropertyList("fe80::1%"), PropertyList(7)}) {
        const IPv4Reading reading = readIPv4Configuration(std::nullopt, dnsWith({"192.0.2.53", server}));
        EXPECT_EQ(reading.status, platform::kNetworkConfigInvalid);
        EXPECT_EQ(reading.configuration, IPv4Configuration());
    }
}

TEST(IPv4ConfigurationTest, WhatIsRefusedIsNamed) {
    EXPECT_EQ(readIPv4Configuration(manual("abc", "255.255.255.0"), std::nullopt).detail, "address \"abc\"");
    EXPECT_EQ(readIPv4Configuration(manual("192.0.2.0", "255.255.255.0"), std::nullopt).detail,
              "address 192.0.2.0/24");
    EXPECT_EQ(readIPv4Configuration(manual("192.0.2.7", "abc"), std::nullopt).detail, "subnet mask \"abc\"");
    EXPECT_EQ(readIPv4Configuration(manual("192.0.2.7", "255.255.255.0", "192.0.3.1"), std::nullopt).detail,
              "router \"192.0.3.1\"");
    EXPECT_EQ(readIPv4Configuration(std::nullopt, dnsWith({"abc"})).detail, "name server \"abc\"");
}

} // namespace
} // namespace welcomer::network
