// What every probe of a host's reachability does. Each test has a network namespace of its own.

#include "tests/contract/NetworkBackends.h"
#include "tests/support/MountNamespace.h"
#include "tests/support/NetworkNamespace.h"

#include <gtest/gtest.h>

#include <fstream>
#include <string>

namespace welcomer {
namespace {

class HostReachabilityContractTest : public testing::TestWithParam<NamedNetworkBackend> {
  protected:
    void SetUp() override {
        if (!mayHaveNetwork()) {
            GTEST_SKIP() << "needs the right to make a network namespace";
        }
        enterNetworkNamespace();
        backend = GetParam().make(root);
    }

    std::optional<std::uint32_t> flags(const std::string& host) {
        return backend->reachability().createTarget(host)->flags();
    }

    TemporaryRoot root;
    std::unique_ptr<NetworkBackend> backend;
};

INSTANTIATE_TEST_SUITE_P(Every, HostReachabilityContractTest, testing::ValuesIn(networkBackends()),
                         [](const auto& each) { return each.param.name; });

TEST_P(HostReachabilityContractTest, AHostWithARouteIsReachable) {
    // Not every machine can look up its own name: a file of hosts is missing on the smallest ones.
    enterMountNamespace();
    mountMemory("/etc", "64k");
    std::ofstream("/etc/nsswitch.conf") << "hosts: files\n";
    std::ofstream("/etc/hosts") << "127.0.0.1 localhost\n";
    for (const char* host : {"127.0.0.1", "localhost"}) {
        EXPECT_EQ(flags(host), platform::kHostReachable) << host;
    }
}

TEST_P(HostReachabilityContractTest, ANameThatCannotBeLookedUpIsNotReachable) {
    // Names that no name lookup asks another host about.
    for (const std::string& host : {std::string(), std::string("not a name"), std::string(300, 'x')}) {
        EXPECT_EQ(flags(host).value_or(0), 0U) << host;
    }
}

TEST_P(HostReachabilityContractTest, ATargetAnswersForTheNetworkAsItIsNow) {
    const auto target = backend->reachability().createTarget("192.0.2.1");
    EXPECT_EQ(target->flags(), 0U);
    shell("ip link add p-one type veth peer name p-two && ip addr add 192.0.2.7/24 dev p-one && "
          "ip link set p-one up && ip link set p-two up");
    EXPECT_EQ(target->flags(), platform::kHostReachable);
    shell("ip link del p-one");
    EXPECT_EQ(target->flags(), 0U);
}

} // namespace
} // namespace welcomer
