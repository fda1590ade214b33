#include "backends/local/LocalSystemLog.h"

#include "tests/support/SystemLogSocket.h"

#include <gtest/gtest.h>

#include <cerrno>
#include <optional>
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

TEST_F(LocalSystemLogTest, WithoutASystemLogNothingHappens) {
    socket.reset();
    ASSERT_EQ(::unlink("/dev/log"), 0);

    log.write(115, "message");
    log.write(115, std::string("\0", 1));
}

} // namespace welcomer::local
