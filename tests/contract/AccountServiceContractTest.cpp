// The account services of this machine and of the tests; what each of them keeps is asserted in the header.

#include "tests/contract/AccountServiceContract.h"
#include "tests/contract/LocalAccounts.h"
#include "tests/contract/TimeBackends.h"
#include "tests/fakes/FakeAccountService.h"
#include "tests/fakes/FakeNotificationCenter.h"

#include <chrono>
#include <map>
#include <optional>
#include <string>
#include <type_traits>

namespace welcomer::contract {
namespace {

using namespace std::chrono_literals;

struct FakeAccounts {
    FakeAccounts() {
        const auto answer = [this](const std::string& name, const std::string& password, const auto&) {
            const bool isRight = passwords.contains(name) && passwords[name] == password;
            return std::optional(fakes::FakeAccountService::Answer{
                isRight,
                isRight ? PropertyList::Dictionary{{kSKPropertyAccountID, name}, {"status", 0}}
                        : PropertyList::Dictionary{{kSKPropertyAccountError, 1}},
                1ms, false});
        };
        service.answerAuthenticate = answer;
        service.answerSignIn = answer;
    }

    void addUser(const std::string& name, const std::string& password) {
        passwords[name] = password;
        service.servicesOfNewAccounts[kSKServiceIDContacts] = {};
        service.servicesOfNewAccounts[kSKServiceIDMail] = {
            false, false, {{kSKPropertyMailEmailAddress, "anna@example.org"}}};
    }

    SimulatedTime time;
    std::map<std::string, std::string> passwords;
    fakes::CallRecorder recorder;
    fakes::FakeNotificationCenter center;
    fakes::FakeAccountService service{recorder, center, time.runLoops, time.dispatchQueues};
};

struct BackendNames {
    template <typename Backend>
    static std::string GetName(int) {
        return std::is_same_v<Backend, FakeAccounts>               ? "Fake"
               : std::is_same_v<Backend, LocalAccounts<LocalTime>> ? "Local"
                                                                   : "LocalOnSimulatedTime";
    }
};

using Backends = testing::Types<LocalAccounts<LocalTime>, LocalAccounts<SimulatedTime>, FakeAccounts>;
INSTANTIATE_TYPED_TEST_SUITE_P(Machine, AccountServiceContract, Backends, BackendNames);

} // namespace
} // namespace welcomer::contract
