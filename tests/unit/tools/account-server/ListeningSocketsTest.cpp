#include "tools/account-server/ListeningSockets.h"

#include <gtest/gtest.h>

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
