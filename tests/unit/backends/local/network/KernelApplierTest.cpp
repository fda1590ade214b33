// What a link has after a configuration was applied, and after that failed: each test has a network namespace
// of its own.

#include "backends/local/network/KernelApplier.h"

#include "backends/network/IPv4Text.h"
#include "platform/NetworkConfigStore.h"
#include "tests/contract/TemporaryRoot.h"
#include "tests/support/MountNamespace.h"
#include "tests/support/NetworkNamespace.h"
#include "tests/support/SystemCallFaults.h"

#include <gtest/gtest.h>

#include <cerrno>
#include <filesystem>
#include <string>
#include <vector>

namespace welcomer::local {
namespace {

using network::IPv4Configuration;
using Method = IPv4Configuration::Method;

const std::string kResolver = "# kept\nnameserver 192.0.2.53\n";

IPv4Configuration manual(const std::string& address, int prefixLength, const std::string& router) {
    IPv4Configuration configuration;
    configuration.method = Method::Manual;
    configuration.address = *network::parseIPv4(address);
    configuration.prefixLength = prefixLength;
    configuration.router = network::parseIPv4(router);
    return configuration;
}

IPv4Configuration withServers(IPv4Configuration configuration) {
    configuration.servers = {"192.0.2.1", "2001:db8::1"};
    return configuration;
}

// Answers with a status, and keeps what it was told.
class RecordingNameServers final : public network::NameServerService {
  public:
    std::int32_t setServers(const std::string& device, const std::vector<std::string>& servers,
                            std::string& detail) override {
        told = device;
        for (const std::string& each : servers) {
            told += " " + each;
        }
        detail = "the service";
        return status;
    }

    std::int32_t status = 0;
    std::string told;
};

class KernelApplierTest : public testing::Test {
  protected:
    void SetUp() override {
        if (!mayHaveNetwork()) {
            GTEST_SKIP() << "needs the right to make a network namespace";
        }
        enterNetworkNamespace();
        for (const char* device : {"eth7", "eth8"}) {
            shell(std::string("ip link add ") + device + " type veth peer name p-" + device +
                  " && ip link set " + device + " up && ip link set p-" + device + " up");
        }
        shell("ip addr add 198.51.100.7/24 dev eth8");
        root.addFile("/etc/resolv.conf", kResolver);
    }

    std::int32_t apply(const IPv4Configuration& configuration,
                       network::NameServerService* nameServers = nullptr) {
        return KernelApplier(posix::RootFolder(root.path()), nameServers)
            .apply(configuration, "eth7", detail);
    }

    // Everything that an application may change, as text.
    std::string state() { return links() + root.content("/etc/resolv.conf").value_or("no file"); }
    // Not whether a link has a carrier, which the kernel tells some time later.
    static std::string links() {
        return shell("ip -4 -o addr show; ip -4 -d route show table all | sed 's/ linkdown//'; "
                     "ip -o link show dev eth7 up | wc -l");
    }
    static std::string defaultRoutes() {
        return shell("ip -4 route show default | sed 's/ linkdown//; s/ *$//'");
    }
    static std::string addresses() { return shell("ip -4 -o addr show dev eth7 | awk '{print $4}' | xargs"); }

    void reset(const std::string& commands) {
        shell("ip link set eth7 up; ip -4 addr flush dev eth7; ip -4 route flush dev eth8 proto boot; " +
              commands);
        root.addFile("/etc/resolv.conf", kResolver);
    }

    // Applies a configuration to a link in a certain state, first with the first system call failing, then
    // with the second one, until none is left. What fails has changed nothing, and what succeeds has changed
    // all.
    //  result  how many applications failed
    int failAtEachCall(const std::string& commands, const IPv4Configuration& configuration, int error) {
        reset(commands);
        const std::string before = state();
        EXPECT_EQ(apply(configuration), 0) << commands;
        const std::string after = state();
        EXPECT_NE(before, after) << commands;
        int failures = 0;
        for (int number = 1;; ++number) {
            reset(commands);
            EXPECT_EQ(state(), before);
            SystemCallFaults::failAt(number, error);
            const std::int32_t status = apply(configuration);
            const std::vector<std::string> calls = SystemCallFaults::stop();
            if (calls.size() < static_cast<std::size_t>(number)) {
                return failures;
            }
            EXPECT_EQ(state(), status == 0 ? after : before)
                << commands << ": " << calls[static_cast<std::size_t>(number) - 1] << ", call " << number;
            failures += status == 0 ? 0 : 1;
            if (HasFailure()) {
                return failures;
            }
        }
    }

    TemporaryRoot root;
    std::string detail;
};

constexpr char kWorking[] =
    "ip addr add 10.0.0.9/8 brd + dev eth7 label eth7:work; ip addr add 192.0.2.9/24 dev eth7; "
    "ip addr add 10.0.0.10/8 dev eth7; ip route add 172.16.0.0/12 via 10.0.0.2 src 10.0.0.10 mtu 1300; "
    "ip route add default via 10.0.0.1 dev eth7; ip route append default via 198.51.100.1 dev eth8; "
    "ip route add default via 192.0.2.2 dev eth7 metric 70; ip route add default via 10.0.0.3 table 77; "
    "ip route add 203.0.113.0/24 nexthop via 10.0.0.4 dev eth7 nexthop via 10.0.0.5 dev eth7";

TEST_F(KernelApplierTest, WhateverSystemCallFailsTheLinkKeepsWhatItHad) {
    EXPECT_GT(failAtEachCall(kWorking, withServers(manual("192.0.2.7", 24, "192.0.2.1")), ENOBUFS), 20);
}

TEST_F(KernelApplierTest, TheSameForALinkThatIsDownAndForOneThatHasTheAddressAlready) {
    const IPv4Configuration configuration = withServers(manual("192.0.2.7", 24, "192.0.2.1"));
    EXPECT_GT(failAtEachCall("ip link set eth7 down", configuration, ENOMEM), 10);
    EXPECT_GT(
        failAtEachCall("ip link set eth7 down; ip addr add 192.0.2.9/25 dev eth7", configuration, ENOMEM),
        10);
    EXPECT_GT(failAtEachCall("ip addr add 192.0.2.9/24 dev eth7; ip addr add 192.0.2.7/24 dev eth7; "
                             "ip route add default via 192.0.2.1 metric 9",
                             configuration, EPERM),
              10);
}

TEST_F(KernelApplierTest, TheSameWithoutARouterAndWithAResolversFileThatIsMountedByItself) {
    enterMountNamespace();
    const std::string file = root.locate("/etc/resolv.conf");
    mountOnItself(file);
    EXPECT_GT(failAtEachCall(kWorking, withServers(manual("10.0.0.9", 8, "none")), EIO), 20);
    unmount(file);
}

TEST_F(KernelApplierTest, ARouterThatTheKernelRefusesTakesNothingAway) {
    reset(kWorking);
    const std::string before = state();
    // The second one only when the address through which it is reached has gone.
    for (const char* outside : {"172.31.255.1", "192.0.2.1"}) {
        EXPECT_EQ(apply(withServers(manual("10.9.0.5", 32, outside))),
                  platform::kNetworkConfigKernelRefused + ENETUNREACH)
            << outside;
        EXPECT_EQ(detail, "eth7");
        EXPECT_EQ(state(), before) << outside;
    }
}

TEST_F(KernelApplierTest, NameServersThatCannotBeStoredTakeNothingAway) {
    reset(kWorking);
    std::filesystem::remove(root.locate("/etc/resolv.conf"));
    root.addDirectory("/etc/resolv.conf");
    const std::string before = links();
    EXPECT_EQ(apply(withServers(manual("192.0.2.7", 24, "192.0.2.1"))),
              platform::kNetworkConfigNameServersNotWritten);
    EXPECT_EQ(links(), before);
}

TEST_F(KernelApplierTest, ADHCPClientThatCannotBeStartedTakesNothingAway) {
    if (!DHCPClient(posix::RootFolder(root.path())).isInstalled()) {
        GTEST_SKIP() << "needs a DHCP client, which is not started";
    }
    reset(kWorking);
    root.addFile("/run/welcomer", "no folder for the client's files");
    const std::string before = state();
    IPv4Configuration configuration;
    configuration.method = Method::DHCP;
    EXPECT_EQ(apply(configuration), platform::kNetworkConfigDHCPClientFailed);
    EXPECT_EQ(state(), before);
}

TEST_F(KernelApplierTest, AnotherLinksDefaultRouteStaysAndTheNewOneHasAMetricOfItsOwn) {
    reset("ip route add default via 198.51.100.1 dev eth8; ip route append default via 198.51.100.2 dev eth8 "
          "metric 2");
    for (int round = 0; round < 2; ++round) {
        EXPECT_EQ(apply(manual("192.0.2.7", 24, "192.0.2.1")), 0);
        EXPECT_EQ(defaultRoutes(), "default via 198.51.100.1 dev eth8\n"
                                   "default via 192.0.2.1 dev eth7 proto static metric 1\n"
                                   "default via 198.51.100.2 dev eth8 metric 2\n");
    }
    EXPECT_EQ(addresses(), "192.0.2.7/24\n");
    EXPECT_EQ(apply(manual("192.0.2.7", 24, "none")), 0);
    EXPECT_EQ(defaultRoutes(),
              "default via 198.51.100.1 dev eth8\ndefault via 198.51.100.2 dev eth8 metric 2\n");
}

TEST_F(KernelApplierTest, ARouteOverSeveralLinksAndOneThatForbidsAreOthersToo) {
    reset("ip addr add 10.0.0.9/8 dev eth7; ip route add default nexthop via 10.0.0.1 dev eth7 nexthop via "
          "198.51.100.1 dev "
          "eth8; ip route add unreachable default metric 1");
    EXPECT_EQ(apply(manual("10.0.0.7", 8, "10.0.0.2")), 0);
    EXPECT_EQ(defaultRoutes(), "default\n\tnexthop via 10.0.0.1 dev eth7 weight 1\n"
                               "\tnexthop via 198.51.100.1 dev eth8 weight 1\n"
                               "unreachable default metric 1\n"
                               "default via 10.0.0.2 dev eth7 proto static metric 2\n");
    shell("ip route del default metric 0; ip route del unreachable default metric 1");
    EXPECT_EQ(apply(manual("10.0.0.7", 8, "10.0.0.2")), 0);
    EXPECT_EQ(defaultRoutes(), "default via 10.0.0.2 dev eth7 proto static\n");
}

TEST_F(KernelApplierTest, AnAddressThatWasLentIsTheLinksOwnAfterwards) {
    reset("ip addr add 192.0.2.7/24 dev eth7 valid_lft 3600 preferred_lft 3600");
    EXPECT_EQ(apply(manual("192.0.2.7", 24, "192.0.2.1")), 0);
    EXPECT_NE(shell("ip -4 addr show dev eth7").find("valid_lft forever"), std::string::npos);
}

// Name servers

class NameServersTest : public KernelApplierTest {
  protected:
    void SetUp() override {
        KernelApplierTest::SetUp();
        if (!IsSkipped()) {
            reset(kWorking);
        }
    }
    void linkTo(const std::string& target) {
        std::filesystem::remove(root.locate("/etc/resolv.conf"));
        std::filesystem::create_symlink(target, root.locate("/etc/resolv.conf"));
    }
    RecordingNameServers service;
};

TEST_F(NameServersTest, WhereTheFileIsResolvedsTheyGoToThat) {
    for (const char* target :
         {"../run/systemd/resolve/stub-resolv.conf", "/run/systemd/resolve/stub-resolv.conf",
          "/run/systemd/resolve/resolv.conf", "../usr/lib/systemd/resolv.conf", "/lib/systemd/resolv.conf"}) {
        linkTo(target);
        service.told.clear();
        EXPECT_EQ(apply(withServers(manual("192.0.2.7", 24, "192.0.2.1")), &service), 0) << target;
        EXPECT_EQ(service.told, "eth7 192.0.2.1 2001:db8::1") << target;
        EXPECT_EQ(addresses(), "192.0.2.7/24\n");
    }
}

TEST_F(NameServersTest, WhatItRefusesTakesNothingAway) {
    linkTo("../run/systemd/resolve/stub-resolv.conf");
    const std::string before = state();
    service.status = platform::kNetworkConfigNameServersNotWritten;
    EXPECT_EQ(apply(withServers(manual("192.0.2.7", 24, "192.0.2.1")), &service),
              platform::kNetworkConfigNameServersNotWritten);
    EXPECT_EQ(detail, "the service");
    EXPECT_EQ(state(), before);
}

TEST_F(NameServersTest, AFileOfAnotherProgramIsNotForIt) {
    linkTo("../run/other/resolv.conf");
    const std::string before = state();
    EXPECT_EQ(apply(withServers(manual("192.0.2.7", 24, "192.0.2.1")), &service),
              platform::kNetworkConfigNameServersElsewhere);
    EXPECT_EQ(service.told, "");
    EXPECT_EQ(state(), before);
    linkTo("../run/systemd/resolve/stub-resolv.conf"); // and nobody to tell
    EXPECT_EQ(apply(withServers(manual("192.0.2.7", 24, "192.0.2.1"))),
              platform::kNetworkConfigNameServersElsewhere);
    EXPECT_EQ(state(), before);
}

TEST_F(NameServersTest, AFileOfOurOwnIsWrittenWithoutIt) {
    EXPECT_EQ(apply(withServers(manual("192.0.2.7", 24, "192.0.2.1")), &service), 0);
    EXPECT_EQ(service.told, "");
    EXPECT_EQ(root.content("/etc/resolv.conf"), "# kept\nnameserver 192.0.2.1\nnameserver 2001:db8::1\n");
}

TEST_F(NameServersTest, WithoutAMethodOnlyTheServersChange) {
    const std::string link = addresses();
    IPv4Configuration configuration;
    EXPECT_EQ(apply(withServers(configuration), &service), 0);
    configuration.method = Method::LinkLocal;
    EXPECT_EQ(apply(withServers(configuration), &service), 0);
    EXPECT_EQ(addresses(), link);
    EXPECT_EQ(root.content("/etc/resolv.conf"), "# kept\nnameserver 192.0.2.1\nnameserver 2001:db8::1\n");
}

} // namespace
} // namespace welcomer::local
