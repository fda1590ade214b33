#include "tools/resolver-sync/Overrides.h"

#include "backends/Backends.h"
#include "tests/contract/TemporaryRoot.h"

#include <gtest/gtest.h>

namespace welcomer::resolver {
namespace {

TEST(ResolverOverride, TheSwitchesOwnFileNamesDomainAndNameserver) {
    EXPECT_EQ(
        readOverride("x", "# Switch override for Nimbus\ndomain nimbus.example\nnameserver 192.0.2.3\n"),
        (OverrideFile{"nimbus.example", {{"192.0.2.3", 53}}, ""}));
}

TEST(ResolverOverride, TheFilesNameIsTheDomainWhenNoLineSaysIt) {
    EXPECT_EQ(readOverride("Online.Example.", "nameserver 192.0.2.3").domain, "online.example");
}

TEST(ResolverOverride, EveryNameserverCountsWithTheFilesPort) {
    EXPECT_EQ(
        readOverride("a.example", " nameserver\t192.0.2.3 # one\r\nport 5353\nnameserver 2001:db8::1\n"),
        (OverrideFile{"a.example", {{"192.0.2.3", 5353}, {"2001:db8::1", 5353}}, ""}));
}

TEST(ResolverOverride, OtherLinesAndCommentsDoNotCount) {
    EXPECT_EQ(readOverride("a.example",
                           "#nameserver 192.0.2.1\n;nameserver 192.0.2.2\n\ntimeout 5\nsearch b.example\n"
                           "nameserver 192.0.2.3\nnameservers 192.0.2.4\n"),
              (OverrideFile{"a.example", {{"192.0.2.3", 53}}, ""}));
}

TEST(ResolverOverride, ThatNamesNoNameserverIsRefused) {
    EXPECT_EQ(readOverride("a.example", "domain a.example\n").error, "it names no nameserver");
    EXPECT_EQ(readOverride("a.example", "").error, "it names no nameserver");
}

TEST(ResolverOverride, WhatIsNoAddressIsRefused) {
    EXPECT_EQ(readOverride("a.example", "nameserver one\n").error, "\"one\" is no address");
    EXPECT_EQ(readOverride("a.example", "nameserver\n").error, "\"\" is no address");
    EXPECT_EQ(readOverride("a.example", "nameserver fe80::1%eth0\n").error, "\"fe80::1%eth0\" is no address");
    EXPECT_EQ(readOverride("a.example", "nameserver fe80::1\n").error, "");
    EXPECT_EQ(readOverride("a.example", "nameserver 192.0.2.1\nnameserver 1.2.3\n").error,
              "\"1.2.3\" is no address");
}

TEST(ResolverOverride, WhatIsNoPortIsRefused) {
    for (const std::string port : {"0", "65536", "-1", "53a", ""}) {
        EXPECT_EQ(readOverride("a.example", "port " + port + "\nnameserver 192.0.2.1\n").error,
                  "\"" + port + "\" is no port");
    }
}

TEST(ResolverOverride, WhatIsNoDomainIsRefusedSinceItGoesIntoOtherProgramsFiles) {
    for (const std::string domain : {"a/b", "a#b", "..", "a..b", ".a", ".", "a~", "a=b", "\xc3\xa9"}) {
        EXPECT_EQ(readOverride(domain, "nameserver 192.0.2.1\n").error, "\"" + domain + "\" is no domain");
    }
    EXPECT_EQ(readOverride("a.example", "domain\nnameserver 192.0.2.1\n").error, "\"\" is no domain");
}

TEST(ResolverOverride, ADomainAndItsLabelsAreAsLongAsTheNameSystemAllows) {
    const std::string label(63, 'a');
    const std::string longest = label + "." + label + "." + label + "." + std::string(61, 'a');
    ASSERT_EQ(longest.size(), 253U);
    EXPECT_EQ(readOverride(longest, "nameserver 192.0.2.1\n").error, "");
    EXPECT_NE(readOverride(longest + "a", "nameserver 192.0.2.1\n").error, "");
    for (const std::string& domain : {label + "a", label + "a.example", "example." + label + "a"}) {
        EXPECT_EQ(readOverride(domain, "nameserver 192.0.2.1\n").error, "\"" + domain + "\" is no domain");
    }
}

TEST(ResolverOverride, AnAddressHasNoNul) {
    EXPECT_EQ(readOverride("a.example", std::string("nameserver 192.0.2.1\0x\n", 24)).error,
              "\"" + std::string("192.0.2.1\0x", 11) + "\" is no address");
}

class OverrideFolderTest : public testing::Test {
  protected:
    OverrideFolder read() { return readOverrides("/etc/resolver"); }

    TemporaryRoot _root;
    std::unique_ptr<PlatformOwner> _owner = buildPlatform({.root = _root.path()});
    const platform::ScopedPlatform _installed{_owner->platform()};
};

TEST_F(OverrideFolderTest, ThatIsMissingHasNone) {
    EXPECT_EQ(read().overrides, Overrides());
    EXPECT_EQ(read().refusals, std::vector<std::string>());
}

TEST_F(OverrideFolderTest, EveryFileCounts) {
    _root.addFile("/etc/resolver/a.example", "nameserver 192.0.2.1\n");
    _root.addFile("/etc/resolver/other", "domain b.example\nnameserver 192.0.2.2\n");
    EXPECT_EQ(read().overrides,
              (Overrides{{"a.example", {{"192.0.2.1", 53}}}, {"b.example", {{"192.0.2.2", 53}}}}));
}

TEST_F(OverrideFolderTest, OfTwoFilesForOneDomainTheFirstCounts) {
    _root.addFile("/etc/resolver/1", "domain a.example\nnameserver 192.0.2.1\n");
    _root.addFile("/etc/resolver/2", "domain A.example\nnameserver 192.0.2.2\n");
    EXPECT_EQ(read().overrides, (Overrides{{"a.example", {{"192.0.2.1", 53}}}}));
    EXPECT_EQ(read().refusals,
              std::vector<std::string>{"/etc/resolver/2: an earlier file is for the same domain"});
}

TEST_F(OverrideFolderTest, AFileThatSaysNothingIsNamedWithTheReason) {
    _root.addFile("/etc/resolver/a.example", "# nothing\n");
    _root.addDirectory("/etc/resolver/b.example");
    EXPECT_EQ(read().overrides, Overrides());
    EXPECT_EQ(read().refusals,
              (std::vector<std::string>{"/etc/resolver/a.example: it names no nameserver",
                                        "/etc/resolver/b.example: it cannot be read as text"}));
}

TEST_F(OverrideFolderTest, AFileThatIsStillEmptyIsPassedOverUntilItIsWritten) {
    _root.addFile("/etc/resolver/a.example", "");
    EXPECT_EQ(read().overrides, Overrides());
    EXPECT_EQ(read().refusals, std::vector<std::string>());
}

} // namespace
} // namespace welcomer::resolver
