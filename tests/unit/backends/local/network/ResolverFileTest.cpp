#include "backends/local/network/ResolverFile.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace welcomer::local {
namespace {

using Servers = std::vector<std::string>;

TEST(ResolverFileTest, ServersAreReadInOrder) {
    EXPECT_EQ(
        readResolverText("nameserver 192.0.2.1\nnameserver\t2001:db8::1  # x\nnameserver 192.0.2.3").servers,
        (Servers{"192.0.2.1", "2001:db8::1", "192.0.2.3"}));
}

TEST(ResolverFileTest, OtherLinesMeanNothing) {
    const ResolverConfiguration read = readResolverText(
        "# nameserver 192.0.2.1\n; nameserver 192.0.2.2\n nameserver 192.0.2.3\nnameservers 192.0.2.4\n"
        "nameserver\nnameserver   \nnameserver \x01\x02\noptions timeout:1\n\n");
    EXPECT_EQ(read.servers, Servers());
    EXPECT_EQ(read.domain, std::nullopt);
}

TEST(ResolverFileTest, TheLastDomainOrSearchLineCounts) {
    EXPECT_EQ(readResolverText("domain one.example\n").domain, "one.example");
    EXPECT_EQ(readResolverText("search one.example two.example\n").domain, "one.example");
    EXPECT_EQ(readResolverText("domain one.example\nsearch two.example\n").domain, "two.example");
    EXPECT_EQ(readResolverText("search two.example\ndomain one.example\r\n").domain, "one.example");
    EXPECT_EQ(readResolverText("domain one.example\ndomain \xff\n").domain, "one.example");
}

TEST(ResolverFileTest, NewServersTakeThePlaceOfTheFirstAndOtherLinesStay) {
    EXPECT_EQ(replaceResolverServers("# a\nnameserver 1\n\xff b\nnameserver 2\noptions c", {"3", "4"}),
              "# a\nnameserver 3\nnameserver 4\n\xff b\noptions c");
}

TEST(ResolverFileTest, WithoutServersTheNewOnesStandAtTheEnd) {
    EXPECT_EQ(replaceResolverServers("", {"3"}), "nameserver 3\n");
    EXPECT_EQ(replaceResolverServers("options c", {"3"}), "options c\nnameserver 3\n");
    EXPECT_EQ(replaceResolverServers("options c\n", {"3"}), "options c\nnameserver 3\n");
}

} // namespace
} // namespace welcomer::local
