#include "backends/local/LocalSystemLog.h"

#include "tests/support/SystemLogSocket.h"

#include <gtest/gtest.h>

#include <cerrno>
#include <optional>
#include <string>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

namespace welcomer::local {

namespace {

class LocalSystemLogTest : public testing::Test {
  protected:
    void SetUp() override {
        if (!SystemLogSocket::isPossible()) {
            GTEST_SKIP() << "a log socket of the test's own needs the right to mount";
        }
        socket.emplace();
    }

    std::optional<SystemLogSocket> socket;
    LocalSystemLog log;
};

} // namespace

TEST_F(LocalSystemLogTest, ARecordsIdentityIsTheProgramsName) {
    log.write(115, "message");

    const auto records = socket->take();
    ASSERT_EQ(records.size(), 1U);
    EXPECT_EQ(records.front().program, program_invocation_short_name);
}

TEST_F(LocalSystemLogTest, ANulIsShownAndDoesNotEndTheMessage) {
    log.write(115, std::string("before\0after\0", 13));

    const auto records = socket->take();
    ASSERT_EQ(records.size(), 1U);
    EXPECT_EQ(records.front().message, "before\\0after\\0");
}

TEST_F(LocalSystemLogTest, AMessageIsWholeUpToTheLongestOneAndThenCut) {
    const std::string longest(kMaximumLogMessage, 'x');
    log.write(115, longest);
    log.write(115, longest + "x");
    log.write(115, std::string(std::size_t{1} << 20U, 'x'));

    const auto records = socket->take();
    ASSERT_EQ(records.size(), 3U); // none is lost
    EXPECT_EQ(records[0].message, longest);
    const std::string cut = longest.substr(0, kMaximumLogMessage - 3) + "…";
    EXPECT_EQ(records[1].message, cut);
    EXPECT_EQ(records[2].message, cut);
}

TEST_F(LocalSystemLogTest, ACutSplitsNoCharacterAndNulsCountAsTheyAreShown) {
    std::string birds;
    for (int i = 0; i < 100000; ++i) {
        birds += "\U0001f426";
    }
    log.write(115, birds);
    log.write(115, std::string(kMaximumLogMessage, '\0'));

    const auto records = socket->take();
    ASSERT_EQ(records.size(), 2U);
    EXPECT_EQ(records[0].message, birds.substr(0, kMaximumLogMessage - 4) + "…");
    EXPECT_EQ(records[1].message.size(), kMaximumLogMessage);
    EXPECT_TRUE(records[1].message.ends_with("…"));
}

TEST_F(LocalSystemLogTest, ADaemonThatWasStartedAnewGetsTheNextRecordWhole) {
    log.write(115, "before");
    socket.reset();
    ASSERT_EQ(::unlink("/dev/log"), 0);
    sockaddr_un address = {AF_UNIX, "/dev/log"};
    const int listening = ::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
    ASSERT_EQ(::bind(listening, reinterpret_cast<const sockaddr*>(&address), sizeof address), 0);
    ASSERT_EQ(::listen(listening, 1), 0);

    log.write(115, "after");

    const int connection = ::accept(listening, nullptr, nullptr);
    std::string record(100, '\0');
    const ssize_t size = ::recv(connection, record.data(), record.size(), 0);
    ASSERT_GT(size, 0);
    record.resize(static_cast<std::size_t>(size));
    EXPECT_TRUE(record.ends_with(": after" + std::string(1, '\0'))) << record;
    ::close(connection);
    ::close(listening);
}

TEST_F(LocalSystemLogTest, WithoutASystemLogNothingHappens) {
    socket.reset();
    ASSERT_EQ(::unlink("/dev/log"), 0);

    log.write(115, "message");
    log.write(115, std::string("\0", 1));
}

} // namespace welcomer::local
