#include "tools/account-server/ListeningSockets.h"

#include "tests/contract/TemporaryRoot.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <stdexcept>

namespace welcomer::server {
namespace {

using Use = ListeningSocket::Use;

ListeningSocket tcp(const char* name, bool isLocal) {
    return {posix::FileDescriptor(), name, "address:1", false, isLocal};
}

TEST(ListeningSockets, AUnixSocketIsServedInTheClear) {
    for (const bool hasCertificate : {false, true}) {
        EXPECT_EQ(useOf({posix::FileDescriptor(), "any", "/run/x", true, true}, hasCertificate), Use::Clear);
    }
}

TEST(ListeningSockets, ASocketOfTheServersOwnIsForItsUserAloneAndTakesTheOldOnesPlace) {
    const TemporaryRoot root;
    const std::string path = root.path() + "/socket";
    for (int i = 0; i < 2; ++i) {
        const std::vector<ListeningSocket> sockets = openListeningSocket(path);
        ASSERT_EQ(sockets.size(), 1U);
        EXPECT_EQ(sockets[0].shown, path);
        EXPECT_EQ(useOf(sockets[0], true), Use::Clear);
        const std::filesystem::file_status status = std::filesystem::status(path);
        EXPECT_EQ(status.type(), std::filesystem::file_type::socket);
        EXPECT_EQ(status.permissions(),
                  std::filesystem::perms::owner_read | std::filesystem::perms::owner_write);
    }
    EXPECT_THROW(openListeningSocket(path + std::string(108, 'x')), std::runtime_error);
    EXPECT_THROW(openListeningSocket(root.path() + "/nowhere/socket"), std::runtime_error);
}

TEST(ListeningSockets, PasswordsInTheClearStayOnThisMachine) {
    EXPECT_THROW(useOf(tcp("any", false), false), std::runtime_error);
    EXPECT_THROW(useOf(tcp("clear", false), true), std::runtime_error);
    EXPECT_THROW(useOf(tcp("clear", false), false), std::runtime_error);
    EXPECT_EQ(useOf(tcp("any", true), false), Use::Clear);
}

TEST(ListeningSockets, ACertificateIsShownWhereThereIsOneUnlessAFrontHasIt) {
    EXPECT_EQ(useOf(tcp("any", false), true), Use::Tls);
    EXPECT_EQ(useOf(tcp("any", true), true), Use::Tls);
    EXPECT_EQ(useOf(tcp("clear", true), true), Use::Clear);
    EXPECT_THROW(useOf(tcp("tls", true), false), std::runtime_error);
}

TEST(ListeningSockets, TheFiguresHaveASocketOfTheirOwn) {
    EXPECT_EQ(useOf(tcp("metrics", false), false), Use::Metrics);
    EXPECT_EQ(useOf(tcp("metrics", true), true), Use::Metrics);
}

} // namespace
} // namespace welcomer::server
