#include "backends/posix/NetlinkMessages.h"

#include <gtest/gtest.h>

#include <array>
#include <cstring>
#include <linux/if_addr.h>
#include <linux/if_link.h>
#include <linux/rtnetlink.h>
#include <memory>
#include <random>
#include <string>
#include <sys/socket.h>
#include <vector>

namespace welcomer::posix {
namespace {

// A message as the kernel has it in memory, and no byte more: its header with these bytes behind it.
class Message {
  public:
    explicit Message(std::string_view payload) : _bytes(new char[sizeof(nlmsghdr) + payload.size()]) {
        payload.copy(_bytes.get() + sizeof(nlmsghdr), payload.size());
        nlmsghdr header = {};
        header.nlmsg_len = static_cast<std::uint32_t>(sizeof header + payload.size());
        std::memcpy(_bytes.get(), &header, sizeof header);
    }
    const nlmsghdr& operator*() const { return *reinterpret_cast<const nlmsghdr*>(_bytes.get()); }

  private:
    std::unique_ptr<char[]> _bytes;
};

// The payload of a message: what follows its header.
std::string payloadOf(NetlinkRequest& request) {
    const nlmsghdr& message = request.message();
    return {reinterpret_cast<const char*>(&message + 1), message.nlmsg_len - sizeof message};
}

std::optional<KernelLink> readLink(std::string_view payload) {
    return posix::readLink(*Message(payload));
}

std::optional<KernelAddress> readAddress(std::string_view payload) {
    return posix::readAddress(*Message(payload));
}

std::optional<KernelRoute> readDefaultRoute(std::string_view payload) {
    return posix::readDefaultRoute(*Message(payload));
}

std::string linkMessage() {
    ifinfomsg body = {};
    body.ifi_index = 7;
    body.ifi_type = 1;
    NetlinkRequest request(RTM_NEWLINK, 0, body);
    request.addText(IFLA_IFNAME, "eth7");
    request.addNumber(IFLA_LINK, 3);
    request.addNumber(IFLA_MASTER, 4);
    const std::array<char, 12> kind = {11, 0, IFLA_INFO_KIND, 0, 'm', 'a', 'c', 'v', 'l', 'a', 'n'};
    request.addNested(IFLA_LINKINFO, [&] { request.addBody(kind); }); // its text has no zero byte of its own
    return payloadOf(request);
}

std::string routeMessage() {
    rtmsg body = {};
    body.rtm_family = AF_INET;
    body.rtm_table = RT_TABLE_MAIN;
    body.rtm_type = RTN_UNICAST;
    NetlinkRequest request(RTM_NEWROUTE, 0, body);
    request.addNumber(RTA_OIF, 7);
    request.addAddress(RTA_GATEWAY, 0xC0000201);
    request.addNumber(RTA_PRIORITY, 9);
    return payloadOf(request);
}

std::string addressMessage() {
    ifaddrmsg body = {};
    body.ifa_family = AF_INET;
    body.ifa_prefixlen = 24;
    body.ifa_index = 7;
    NetlinkRequest request(RTM_NEWADDR, 0, body);
    request.addAddress(IFA_ADDRESS, 0xC0000202);
    request.addAddress(IFA_LOCAL, 0xC0000207);
    return payloadOf(request);
}

TEST(NetlinkMessagesTest, ALinkIsReadWithItsAttributes) {
    const auto link = readLink(linkMessage());
    ASSERT_TRUE(link);
    EXPECT_EQ(link->index, 7);
    EXPECT_EQ(link->name, "eth7");
    EXPECT_EQ(link->kind, "macvlan");
    EXPECT_EQ(link->linkIndex, 3);
    EXPECT_EQ(link->masterIndex, 4);
}

TEST(NetlinkMessagesTest, ALinkOfAnotherNamespaceIsNoLinkBelow) {
    ifinfomsg body = {};
    body.ifi_index = 7;
    NetlinkRequest request(RTM_NEWLINK, 0, body);
    request.addNumber(IFLA_LINK_NETNSID, 0);
    request.addNumber(IFLA_LINK, 3);
    request.addText(IFLA_IFNAME, "eth7");
    EXPECT_EQ(readLink(payloadOf(request))->linkIndex, 0);
}

TEST(NetlinkMessagesTest, AnAddressIsTheLinksOwnAndNotItsPeers) {
    EXPECT_EQ(readAddress(addressMessage()), (KernelAddress{7, 0xC0000207, 24}));
}

TEST(NetlinkMessagesTest, ADefaultRouteIsReadWithGatewayAndMetric) {
    EXPECT_EQ(readDefaultRoute(routeMessage()), (KernelRoute{7, 0xC0000201, 9, false}));
}

TEST(NetlinkMessagesTest, MessagesOfOtherFamiliesAndRoutesAreNone) {
    std::string address = addressMessage();
    address[0] = AF_INET6;
    EXPECT_FALSE(readAddress(address));
    address = addressMessage();
    address[1] = 33; // the prefix length
    EXPECT_FALSE(readAddress(address));
    std::string route = routeMessage();
    route[1] = 8; // the destination's length
    EXPECT_FALSE(readDefaultRoute(route));
    route = routeMessage();
    route[4] = 99; // the table
    EXPECT_FALSE(readDefaultRoute(route));
}

TEST(NetlinkMessagesTest, CutOffMessagesAreNone) {
    for (const auto& [message, read] : std::vector<std::pair<std::string, bool (*)(std::string_view)>>{
             {linkMessage(),
              [](std::string_view bytes) {
                  return readLink(bytes).has_value();
              }},
             {addressMessage(),
              [](std::string_view bytes) {
                  return readAddress(bytes).has_value();
              }},
             {routeMessage(), [](std::string_view bytes) {
                  return readDefaultRoute(bytes).has_value();
              }}}) {
        EXPECT_TRUE(read(message));
        for (std::size_t size = 0; size < 12; ++size) {
            EXPECT_FALSE(read(message.substr(0, size)));
        }
        EXPECT_FALSE(read(message.substr(0, message.size() - 5)));
        for (std::size_t size = 0; size < message.size(); ++size) {
            read(std::string(message.data(), size)); // within its bounds, which the sanitizers watch
        }
    }
}

TEST(NetlinkMessagesTest, LengthsThatMakeNoSenseEndTheReading) {
    std::string message = linkMessage();
    for (const char length : {'\0', '\3', '\xff'}) {
        message[sizeof(ifinfomsg)] = length;
        EXPECT_FALSE(readLink(message));
    }
}

TEST(NetlinkMessagesTest, RandomBytesAreReadWithinTheirBounds) {
    std::mt19937 random(1);
    for (int round = 0; round < 20000; ++round) {
        std::string bytes =
            round % 3 == 0 ? linkMessage() : (round % 3 == 1 ? addressMessage() : routeMessage());
        for (int change = 0; change < 4; ++change) {
            bytes[random() % bytes.size()] = static_cast<char>(random());
        }
        const std::string exact(bytes.data(), random() % (bytes.size() + 1));
        readLink(exact);
        readAddress(exact);
        readDefaultRoute(exact);
    }
}

TEST(NetlinkMessagesTest, OfARouteWithSeveralHopsTheFirstOneCountsAndOthersShareIt) {
    for (const int other : {7, 8}) {
        rtmsg body = {};
        body.rtm_family = AF_INET;
        body.rtm_table = RT_TABLE_MAIN;
        body.rtm_type = RTN_UNICAST;
        NetlinkRequest request(RTM_NEWROUTE, 0, body);
        request.addNested(RTA_MULTIPATH, [&] {
            request.addBody(rtnexthop{16, 0, 0, 7});
            request.addAddress(RTA_GATEWAY, 0xC0000201);
            request.addBody(rtnexthop{16, 0, 0, other});
            request.addAddress(RTA_GATEWAY, 0xC0000202);
        });
        EXPECT_EQ(readDefaultRoute(payloadOf(request)), (KernelRoute{7, 0xC0000201, 0, other != 7}));
        std::string cut = payloadOf(request);
        cut[sizeof(rtmsg) + 4] = 60; // the first hop's length
        EXPECT_FALSE(readDefaultRoute(cut)->isUsable);
    }
}

} // namespace
} // namespace welcomer::posix
