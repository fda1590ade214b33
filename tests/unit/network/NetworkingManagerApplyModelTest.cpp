// Applying, against a model of the rules that shares nothing with the code.

#include "tests/unit/network/NetworkingManagerApplyFixture.h"

#include <cstdint>
#include <ostream>

namespace welcomer {
namespace {

struct Case {
    std::uint64_t warningType;
    std::string choice;
    std::string method;
    bool hasCable;
    std::string failing; // what fails, or none
    std::int32_t code;   // and its code
    std::int64_t wait;
    std::uint64_t failingProbes;

    friend std::ostream& operator<<(std::ostream& out, const Case& each) {
        return out << "type " << each.warningType << ", " << each.choice << ", " << each.method << ", cable "
                   << each.hasCable << ", failing " << each.failing << " with " << each.code << ", wait "
                   << each.wait << ", failing probes " << each.failingProbes;
    }
};

struct Expected {
    bool result = true;
    std::string error; // "", "reachability", "configuration"
    std::uint64_t probes = 0;
    std::uint64_t sleeps = 0;
    Lines calls; // to the store
};

// What a service's IPv4 configuration becomes, nothing being there before.
std::string modelConfiguration(const std::string& method) {
    if (method == "Manual") {
        return "{Addresses = (192.0.2.7); ConfigMethod = Manual; Router = 192.0.2.1; SubnetMasks = "
               "(255.255.255.0)}";
    }
    if (method == "Manual DHCP") {
        return "{Addresses = (192.0.2.7); ConfigMethod = INFORM}";
    }
    return method == "BootP" ? "{ConfigMethod = BOOTP}" : "{ConfigMethod = DHCP; DHCPClientID = me}";
}

// Configures one service.
//  result  whether that counts as success
bool modelService(const Case& given, const std::string& id, Lines& calls) {
    const auto fails = [&](const std::string& call) {
        return given.failing == call;
    };
    calls.push_back("addProtocolType " + id + ", IPv4");
    if (fails("addProtocolType") || fails("copyProtocol IPv4")) {
        return false;
    }
    calls.push_back("setConfiguration " + id + ", IPv4, " + modelConfiguration(given.method));
    calls.push_back("addProtocolType " + id + ", DNS");
    if (fails("copyProtocol DNS")) {
        return false;
    }
    calls.push_back("setConfiguration " + id + ", DNS, {ServerAddresses = (192.0.2.53)}");
    calls.emplace_back("commit");
    calls.emplace_back(fails("commit") ? "synchronize" : "apply");
    return !(fails("commit") || fails("apply")) || given.code == 0;
}

Expected model(const Case& given) {
    Expected expected;
    if (given.choice == "lan" && given.warningType > 0) {
        bool configured = false;
        const bool hasServices = given.failing != "set" && given.failing != "services";
        const Lines configuredServices = given.hasCable ? Lines{"wired"} : Lines{"wired", "spare"};
        for (const std::string& id : hasServices ? configuredServices : Lines()) {
            configured = modelService(given, id, expected.calls);
            expected.calls.push_back("setEnabled " + id + ", yes");
        }
        if (!configured) {
            expected.result = false;
            expected.error = "configuration";
            return expected;
        }
    }
    if (given.warningType == 1) {
        const auto most = static_cast<std::uint64_t>(given.wait) + 1;
        expected.result = given.failingProbes < most;
        expected.probes = expected.result ? given.failingProbes + 1 : most;
        expected.sleeps = expected.result ? given.failingProbes : most;
    }
    if (given.warningType == 2 || !expected.result) {
        expected.result = false;
        expected.error = "reachability";
    }
    return expected;
}

class EveryCombinationTest : public ApplyTest, public testing::WithParamInterface<std::uint64_t> {
  protected:
    void check(const Case& given) {
        store.services = services;
        store.stored.clear();
        store.failures.clear();
        store.hasSet = true;
        store.cannotListServices = false;
        NetworkingManager& made = manualManager();
        made.setDns(Lines{"192.0.2.53"});
        made.setDhcpClientID("me");
        made.setUserChoice(given.choice);
        made.setConfigurationMethod(given.method);
        made.setInternetConnectionWarningType(given.warningType);
        made.setSecondsToWaitForInternetReachability(given.wait);
        setLink("eth0", given.hasCable);
        store.hasSet = given.failing != "set";
        store.cannotListServices = given.failing == "services";
        if (!given.failing.empty()) {
            store.failures[given.failing] = {given.code};
        }
        fake.hostReachability.probes = 0;
        fake.hostReachability.failingProbes = given.failingProbes;
        const auto start = fake.virtualTime.now();
        const Expected expected = model(given);
        EXPECT_EQ(apply(made), expected.result);
        EXPECT_EQ(error, expected.error.empty()             ? untouched
                         : expected.error == "reachability" ? reachabilityError
                                                            : configurationError);
        EXPECT_EQ(fake.hostReachability.probes, expected.probes);
        EXPECT_EQ(fake.virtualTime.now() - start,
                  std::chrono::seconds(static_cast<std::int64_t>(expected.sleeps)));
        Lines calls;
        for (const std::string& call : storeCalls()) {
            calls.push_back(call.substr(kStore.size()));
        }
        EXPECT_EQ(calls, expected.calls);
    }

    const std::vector<fakes::FakeService> services = store.services;
};

TEST_P(EveryCombinationTest, ComesOutAsTheRulesSay) {
    const std::vector<std::string> failures = {"",
                                               "set",
                                               "services",
                                               "copyProtocol IPv4",
                                               "copyProtocol DNS",
                                               "addProtocolType",
                                               "setConfiguration",
                                               "setEnabled",
                                               "commit",
                                               "apply"};
    int cases = 0;
    for (const char* choice : {"lan", "wifi", "no", "other"}) {
        for (const char* method : {"Manual", "Manual DHCP", "DHCP", "BootP", "other"}) {
            for (const bool hasCable : {true, false}) {
                for (const std::string& failing : failures) {
                    for (const std::int32_t code : {0, 7}) {
                        for (const std::uint64_t failingProbes : {0U, 1U, 3U, 4U}) {
                            for (const std::int64_t wait : {0, 3}) {
                                const Case given{GetParam(), choice, method, hasCable,
                                                 failing,    code,   wait,   failingProbes};
                                check(given);
                                ASSERT_FALSE(HasFailure()) << given;
                                ++cases;
                            }
                        }
                    }
                }
            }
        }
    }
    EXPECT_EQ(cases, 4 * 5 * 2 * 10 * 2 * 4 * 2);
}

INSTANTIATE_TEST_SUITE_P(WarningTypes, EveryCombinationTest, testing::Values(0U, 1U, 2U, 3U, 1000U));

} // namespace
} // namespace welcomer
