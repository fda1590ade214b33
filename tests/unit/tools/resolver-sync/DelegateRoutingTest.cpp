#include "tools/resolver-sync/DelegateRouting.h"

#include "backends/Backends.h"
#include "tests/contract/TemporaryRoot.h"

#include <gtest/gtest.h>

namespace welcomer::resolver {
namespace {

class DelegateRoutingTest : public testing::Test {
  protected:
    DelegateRoutingTest() { _root.addDirectory("/run/systemd"); }

    std::vector<std::string> names() { return _root.names("/run/systemd/dns-delegate.d"); }

    TemporaryRoot _root;
    std::unique_ptr<PlatformOwner> _owner = buildPlatform({.root = _root.path()});
    const platform::ScopedPlatform _installed{_owner->platform()};
    int _reloads = 0;
    platform::Outcome _reloadOutcome;
    DelegateRouting _routing{"/run/systemd/dns-delegate.d", [this] {
                                 ++_reloads;
                                 return _reloadOutcome;
                             }};
};

TEST_F(DelegateRoutingTest, AFileDelegatesOneDomainAndNoOtherNames) {
    EXPECT_EQ(delegateText("a.example", {{"192.0.2.1", 53}}),
              "[Delegate]\nDNS=192.0.2.1\nDomains=~a.example\nDefaultRoute=no\n");
}

TEST_F(DelegateRoutingTest, AFileNamesEveryNameserverWithItsPort) {
    EXPECT_EQ(
        delegateText("a.example",
                     {{"192.0.2.1", 5353}, {"192.0.2.2", 53}, {"2001:db8::1", 53}, {"2001:db8::2", 5353}}),
        "[Delegate]\nDNS=192.0.2.1:5353 192.0.2.2 2001:db8::1 [2001:db8::2]:5353\nDomains=~a.example\n"
        "DefaultRoute=no\n");
}

TEST_F(DelegateRoutingTest, EachDomainIsAFileAndTheResolverIsToldOnce) {
    EXPECT_TRUE(_routing.apply({{"a.example", {{"192.0.2.1", 53}}}, {"b.example", {{"192.0.2.2", 53}}}}));
    EXPECT_EQ(names(), (std::vector<std::string>{"welcomer-a.example.dns-delegate",
                                                 "welcomer-b.example.dns-delegate"}));
    EXPECT_EQ(_root.content("/run/systemd/dns-delegate.d/welcomer-b.example.dns-delegate"),
              delegateText("b.example", {{"192.0.2.2", 53}}));
    EXPECT_EQ(_reloads, 1);
}

TEST_F(DelegateRoutingTest, WhatHasNotChangedIsNotToldAgain) {
    EXPECT_TRUE(_routing.apply({}));
    EXPECT_EQ(_reloads, 0);
    const Overrides overrides{{"a.example", {{"192.0.2.1", 53}}}};
    EXPECT_TRUE(_routing.apply(overrides));
    EXPECT_TRUE(_routing.apply(overrides));
    EXPECT_EQ(_reloads, 1);
    EXPECT_TRUE(_routing.apply({{"a.example", {{"192.0.2.2", 53}}}}));
    EXPECT_EQ(_reloads, 2);
}

TEST_F(DelegateRoutingTest, WithoutOverridesNoFileOfOursIsLeftAndThoseOfOthersStay) {
    _root.addFile("/run/systemd/dns-delegate.d/office.dns-delegate", "[Delegate]\n");
    EXPECT_TRUE(_routing.apply({{"a.example", {{"192.0.2.1", 53}}}}));
    EXPECT_TRUE(_routing.apply({}));
    EXPECT_EQ(names(), std::vector<std::string>{"office.dns-delegate"});
    EXPECT_EQ(_reloads, 2);
}

TEST_F(DelegateRoutingTest, AResolverThatCannotBeToldIsAFailure) {
    _reloadOutcome = platform::Outcome::failure({0, "no manager"});
    EXPECT_EQ(_routing.apply({{"a.example", {{"192.0.2.1", 53}}}}).error.message, "no manager");
}

TEST_F(DelegateRoutingTest, AFolderThatCannotBeMadeIsAFailureThatNamesIt) {
    _root.addFile("/run/systemd/dns-delegate.d", "");
    const platform::Outcome outcome = _routing.apply({{"a.example", {{"192.0.2.1", 53}}}});
    EXPECT_FALSE(outcome);
    EXPECT_NE(outcome.error.message.find("/run/systemd/dns-delegate.d"), std::string::npos);
}

} // namespace
} // namespace welcomer::resolver
