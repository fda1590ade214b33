// The account service's contract, whose header has the assertions, on the real daemon.

#include "tests/contract/AccountServiceContract.h"
#include "tests/integration/accounts/OnlineAccountSession.h"
#include "tests/integration/accounts/OnlineAccountsBus.h"

#include <string>
#include <type_traits>

namespace welcomer::contract {
namespace {

// The user has accounts that are all switched off.
struct WithAccounts : RunningOnlineAccounts {
    WithAccounts() {
        OnlineAccountsBus bus;
        bus.addCloudAccount("anna", false);
        bus.addMailAccount("anna", "anna@example.org", false);
    }
};
struct WithoutDaemon : OnlineAccountSession {
    WithoutDaemon() { session.startBus(); }
};
struct WithoutBus : OnlineAccountSession {};

struct BackendNames {
    template <typename Backend>
    static std::string GetName(int) {
        if (std::is_base_of_v<WithAccounts, Backend>) {
            return "WithAccounts";
        }
        if (std::is_base_of_v<WithoutDaemon, Backend>) {
            return "WithoutDaemon";
        }
        return std::is_base_of_v<WithoutBus, Backend> ? "WithoutBus" : "WithoutAccounts";
    }
};

using Backends =
    testing::Types<OnlineAccountsOf<WithAccounts, LocalTime>,
                   OnlineAccountsOf<RunningOnlineAccounts, LocalTime>,
                   OnlineAccountsOf<WithoutDaemon, LocalTime>, OnlineAccountsOf<WithoutBus, LocalTime>>;
INSTANTIATE_TYPED_TEST_SUITE_P(RealDaemon, AccountServiceContract, Backends, BackendNames);

} // namespace
} // namespace welcomer::contract
