// The account service on online accounts in memory; tests/integration/accounts has it on the real daemon.
// What it keeps is asserted in the contract's header.

#include "tests/contract/AccountServiceContract.h"
#include "tests/contract/OnlineAccountBackend.h"
#include "tests/contract/TimeBackends.h"
#include "tests/fakes/FakeOnlineAccounts.h"

namespace welcomer::contract {
namespace {

struct OnlineAccountsInMemory {
    fakes::FakeOnlineAccounts onlineAccounts;
};

// Anna's account is there, with everything switched off.
struct OnlineAccountsBackend : OnlineAccountsInMemory, OnlineAccountBackend<SimulatedTime> {
    OnlineAccountsBackend() : OnlineAccountBackend([this] { return &onlineAccounts; }) {
        onlineAccounts.add("owncloud", "anna", false);
        onlineAccounts.add("imap_smtp", "anna", false);
    }
};

INSTANTIATE_TYPED_TEST_SUITE_P(OnlineAccounts, AccountServiceContract, OnlineAccountsBackend);

} // namespace
} // namespace welcomer::contract
