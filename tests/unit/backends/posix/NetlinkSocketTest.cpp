#include "backends/posix/NetlinkSocket.h"

#include "tests/support/SystemCallFaults.h"

#include <gtest/gtest.h>

#include <cerrno>
#include <linux/if_link.h>
#include <linux/rtnetlink.h>
#include <string>
#include <vector>

namespace welcomer::posix {
namespace {

// The name of the loopback, asked for by its number.
std::string loopbackThrough(NetlinkSocket& socket, int& error) {
    ifinfomsg body = {};
    body.ifi_index = 1;
    NetlinkRequest request(RTM_GETLINK, 0, body);
    std::string name;
    error = socket.ask(request, [&](const nlmsghdr& message) { name = readLink(message)->name; });
    return name;
}

TEST(NetlinkSocketTest, TheKernelAnswersOneRequestAfterTheOther) {
    NetlinkSocket socket;
    for (int round = 0; round < 3; ++round) {
        int error = -1;
        EXPECT_EQ(loopbackThrough(socket, error), "lo");
        EXPECT_EQ(error, 0);
    }
}

TEST(NetlinkSocketTest, ARefusalGivesTheSystemsErrorNumberAndTheNextRequestIsAnswered) {
    NetlinkSocket socket;
    NetlinkRequest request(RTM_GETLINK, 0, ifinfomsg{});
    request.addText(IFLA_IFNAME, "no such link");
    bool isAnything = false;
    EXPECT_NE(socket.ask(request, [&](const nlmsghdr&) { isAnything = true; }), 0);
    EXPECT_FALSE(isAnything);
    int error = -1;
    EXPECT_EQ(loopbackThrough(socket, error), "lo");
}

TEST(NetlinkSocketTest, AListIsShownAsAWhole) {
    NetlinkSocket socket;
    NetlinkRequest request(RTM_GETLINK, NLM_F_DUMP, ifinfomsg{});
    std::vector<std::string> names;
    int attempts = 0;
    EXPECT_EQ(socket.list(
                  request,
                  [&] {
                      ++attempts;
                      names.clear();
                  },
                  [&](const nlmsghdr& message) { names.push_back(readLink(message)->name); }),
              0);
    EXPECT_GE(attempts, 1);
    EXPECT_EQ(names.front(), "lo");
}

TEST(NetlinkSocketTest, AnAnswerThatWasMissedIsNotMetAgain) {
    NetlinkSocket socket;
    int error = -1;
    EXPECT_EQ(loopbackThrough(socket, error), "lo");
    for (int number = 1; number <= 2; ++number) { // sending, and receiving
        SystemCallFaults::failAt(number, ENOBUFS);
        EXPECT_EQ(loopbackThrough(socket, error), "");
        SystemCallFaults::stop();
        EXPECT_EQ(error, ENOBUFS);
        EXPECT_EQ(loopbackThrough(socket, error), "lo");
        EXPECT_EQ(error, 0);
    }
}

TEST(NetlinkSocketTest, ASignalWhileTheAnswerIsReceivedChangesNothing) {
    NetlinkSocket socket;
    int error = -1;
    EXPECT_EQ(loopbackThrough(socket, error), "lo");
    SystemCallFaults::failAt(2, EINTR);
    EXPECT_EQ(loopbackThrough(socket, error), "lo");
    SystemCallFaults::stop();
    EXPECT_EQ(error, 0);
}

} // namespace
} // namespace welcomer::posix
