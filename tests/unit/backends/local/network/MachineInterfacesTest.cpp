#include "backends/local/network/MachineInterfaces.h"

#include "backends/local/network/WirelessLinks.h"
#include "backends/posix/NetlinkSocket.h"
#include "tests/support/NetworkNamespace.h"

#include <gtest/gtest.h>

#include <linux/genetlink.h>
#include <linux/nl80211.h>
#include <net/if.h>
#include <net/if_arp.h>
#include <string>
#include <vector>

namespace welcomer::local {
namespace {

posix::KernelLink link(int index, const std::string& name, const std::string& kind = "",
                       int masterIndex = 0) {
    posix::KernelLink link;
    link.index = index;
    link.name = name;
    link.hardwareType = ARPHRD_ETHER;
    link.kind = kind;
    link.masterIndex = masterIndex;
    return link;
}

std::vector<std::string> types(const std::vector<MachineLink>& links) {
    std::vector<std::string> shown;
    for (const MachineLink& each : links) {
        shown.push_back(each.type + " " + each.link.name);
    }
    return shown;
}

TEST(MachineInterfacesTest, ALinkOfTheWirelessSubsystemIsWireless) {
    const std::vector<posix::KernelLink> links = {link(7, "p-wlan7"), link(8, "wlan7")};
    EXPECT_EQ(types(listMachineLinks(links, {})),
              (std::vector<std::string>{"Ethernet p-wlan7", "Ethernet wlan7"}));
    EXPECT_EQ(types(listMachineLinks(links, {8})),
              (std::vector<std::string>{"Ethernet p-wlan7", "Wireless wlan7"}));
    EXPECT_EQ(makeInterface(listMachineLinks(links, {8}), "wlan7")->type(), platform::kNetworkWireless);
}

TEST(MachineInterfacesTest, ALinkThatStandsOnAWirelessOneIsOfItsOwnKind) {
    EXPECT_EQ(types(listMachineLinks({link(8, "br0", "bridge"), link(9, "mac0", "macvlan")}, {8, 9})),
              (std::vector<std::string>{"Bridge br0", "MACVLAN mac0"}));
}

TEST(MachineInterfacesTest, APortIsThatOfABridgeOrABond) {
    const auto links = listMachineLinks({link(1, "eth1", "", 5), link(2, "eth2", "veth", 6),
                                         link(3, "eth3", "", 7), link(4, "eth4"), link(5, "br0", "bridge"),
                                         link(6, "bond0", "bond"), link(7, "other", "vrf")},
                                        {});
    EXPECT_TRUE(isPort(links, "eth1"));
    EXPECT_TRUE(isPort(links, "eth2"));
    for (const char* none : {"eth3", "eth4", "br0", "bond0", "gone", ""}) {
        EXPECT_FALSE(isPort(links, none)) << none;
    }
}

TEST(MachineInterfacesTest, TheLinksAreThoseOfTheNetworkNamespace) {
    if (!mayHaveNetwork()) {
        GTEST_SKIP() << "needs the right to make a network namespace";
    }
    enterNetworkNamespace();
    EXPECT_TRUE(listMachineLinks().empty());
    shell("ip link add eth7 type veth peer name eth8; ip link add br0 type bridge; ip link set eth7 master "
          "br0");
    const auto links = listMachineLinks();
    EXPECT_EQ(types(links), (std::vector<std::string>{"Ethernet eth8", "Ethernet eth7", "Bridge br0"}));
    EXPECT_TRUE(isPort(links, "eth7"));
    EXPECT_FALSE(isPort(links, "eth8"));
}

// Generic netlink

TEST(WirelessLinksTest, AnswersAreRead) {
    posix::NetlinkRequest family(GENL_ID_CTRL, 0, genlmsghdr{CTRL_CMD_NEWFAMILY, 2, 0});
    family.addText(CTRL_ATTR_FAMILY_NAME, "nl80211");
    family.addNested(CTRL_ATTR_FAMILY_ID, [&] {});
    EXPECT_EQ(readFamily(family.message(), "nl80211"), 0); // a number that is none
    EXPECT_EQ(readFamily(family.message(), "nl8021"), std::nullopt);

    posix::NetlinkRequest interface(35, 0, genlmsghdr{NL80211_CMD_NEW_INTERFACE, 1, 0});
    EXPECT_EQ(readWirelessLink(interface.message()), std::nullopt); // one without a link of the kernel
    interface.addText(NL80211_ATTR_IFNAME, "wlan7");
    interface.addNumber(NL80211_ATTR_IFINDEX, 8);
    EXPECT_EQ(readWirelessLink(interface.message()), 8);
    interface.message().nlmsg_len = NLMSG_HDRLEN;
    EXPECT_EQ(readWirelessLink(interface.message()), std::nullopt);
}

TEST(WirelessLinksTest, TheKernelTellsItsFamilies) {
    posix::NetlinkSocket socket(NETLINK_GENERIC);
    posix::NetlinkRequest request(GENL_ID_CTRL, NLM_F_DUMP, genlmsghdr{CTRL_CMD_GETFAMILY, 1, 0});
    std::vector<std::uint16_t> numbers;
    const int error = socket.list(
        request, [&] { numbers.clear(); },
        [&](const nlmsghdr& message) {
            if (const auto number = readFamily(message, "nlctrl")) {
                numbers.push_back(*number);
            }
        });
    EXPECT_EQ(error, 0);
    EXPECT_EQ(numbers, std::vector<std::uint16_t>{GENL_ID_CTRL});
}

} // namespace
} // namespace welcomer::local
