#include "tools/account-server/PeerOf.h"

#include <gtest/gtest.h>
#include <netinet/in.h>
#include <sys/socket.h>
#include <unistd.h>

namespace welcomer::server {
namespace {

PeerOf::Connected front() {
    return {{"uid 33", "uid 33"}, true, true};
}

TEST(PeerOf, AnAddressOfIPv6CountsWithItsNetworkAndOneOfIPv4ForItself) {
    EXPECT_EQ(peerAt("192.0.2.7")->counted, "192.0.2.7");
    EXPECT_EQ(peerAt("2001:db8:1:2:3:4:5:6")->shown, "2001:db8:1:2:3:4:5:6");
    EXPECT_EQ(peerAt("2001:db8:1:2:3:4:5:6")->counted, "2001:db8:1:2::/64");
    EXPECT_EQ(peerAt("::ffff:192.0.2.7")->counted, "192.0.2.7");
    EXPECT_FALSE(peerAt("host.example"));
    EXPECT_FALSE(peerAt(""));
}

TEST(PeerOf, AFrontSaysWhomItHasSeenLast) {
    EXPECT_EQ(PeerOf::sender(front(), "192.0.2.1").shown, "192.0.2.1");
    EXPECT_EQ(PeerOf::sender(front(), "10.0.0.1, 192.0.2.1 ").shown, "192.0.2.1");
    EXPECT_EQ(PeerOf::sender(front(), "").shown, "uid 33");
    EXPECT_EQ(PeerOf::sender(front(), "192.0.2.1, somebody").shown, "uid 33");
}

TEST(PeerOf, NobodyElsesWordIsTaken) {
    PeerOf::Connected other = front();
    other.isFront = false;
    EXPECT_EQ(PeerOf::sender(other, "192.0.2.1").shown, "uid 33");
}

class OnASocketPair : public testing::Test {
  protected:
    void SetUp() override { ASSERT_EQ(::socketpair(AF_UNIX, SOCK_STREAM, 0, sockets), 0); }
    void TearDown() override {
        ::close(sockets[0]);
        ::close(sockets[1]);
    }
    const std::string own = "uid " + std::to_string(::getuid());
    int sockets[2] = {-1, -1};
};

TEST_F(OnASocketPair, TheUserAtTheOtherEndIsKnown) {
    const PeerOf::Connected found = PeerOf(Settings()).connected(sockets[0]);
    EXPECT_EQ(found.peer.counted, own);
    EXPECT_TRUE(found.isAllowed);
    EXPECT_FALSE(found.isFront);
}

TEST_F(OnASocketPair, OnlyTheUsersInTheSettingsMayAsk) {
    Settings settings;
    settings.users = {"nobody"};
    EXPECT_EQ(PeerOf(settings).connected(sockets[0]).isAllowed, ::getuid() == 65534);
    settings.users = {"no user of this name"};
    EXPECT_THROW(PeerOf{settings}, std::runtime_error);
}

class OnTheLoopbackAddress : public testing::Test {
  protected:
    void SetUp() override {
        sockaddr_in address{};
        address.sin_family = AF_INET;
        address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
        socklen_t length = sizeof address;
        auto* const where = reinterpret_cast<sockaddr*>(&address);
        ASSERT_EQ(::bind(listening, where, length), 0);
        ASSERT_EQ(::listen(listening, 1), 0);
        ASSERT_EQ(::getsockname(listening, where, &length), 0);
        ASSERT_EQ(::connect(client, where, length), 0);
        server = ::accept(listening, nullptr, nullptr);
        ASSERT_GE(server, 0);
    }
    void TearDown() override {
        for (const int each : {listening, client, server}) {
            ::close(each);
        }
    }
    bool isFront(const Settings& settings) const { return PeerOf(settings).connected(server).isFront; }

    const int listening = ::socket(AF_INET, SOCK_STREAM, 0);
    const int client = ::socket(AF_INET, SOCK_STREAM, 0);
    int server = -1;
};

TEST_F(OnTheLoopbackAddress, AnAddressCanBeAFront) {
    Settings settings;
    EXPECT_FALSE(isFront(settings));
    settings.fronts = {"192.0.2.1", "::1"};
    EXPECT_FALSE(isFront(settings));
    settings.fronts = {"root", "127.0.0.1"};
    EXPECT_TRUE(isFront(settings));
}

TEST_F(OnTheLoopbackAddress, EverybodyThereCanBeAFront) {
    Settings settings;
    settings.trustsLoopback = true;
    EXPECT_TRUE(isFront(settings));
}

} // namespace
} // namespace welcomer::server
