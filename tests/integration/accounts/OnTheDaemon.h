// What the tests of the account service on the real daemon share.

#pragma once

#include "tests/contract/TimeBackends.h"
#include "tests/integration/accounts/OnlineAccountSession.h"
#include "tests/integration/accounts/OnlineAccountsBus.h"

#include <fstream>
#include <gtest/gtest.h>
#include <iterator>
#include <memory>
#include <spawn.h>
#include <string>
#include <sys/wait.h>
#include <vector>

namespace welcomer {

using namespace platform;
using contract::LocalTime;
using Names = std::vector<std::string>;

// Bert is nobody's user: his account has all services.
template <class Session>
class OnTheDaemon : public testing::Test {
  protected:
    std::shared_ptr<CloudAccount> bert() { return backend.service.accountForID("bert", true); }
    void enable(const std::string& identifier, bool isOn = true) {
        bert()->serviceForID(identifier)->enableSilently(isOn);
    }
    bool isEnabled(const std::string& identifier) {
        return backend.service.isServiceEnabled(bert().get(), identifier);
    }
    std::string loggedIn() {
        const auto account = backend.service.loggedInAccount();
        return account ? account->accountID() : "nobody";
    }

    // The end of a sign-in.
    std::string signIn(const std::string& name, const std::string& password) {
        std::string ending;
        std::vector<std::unique_ptr<NotificationObservation>> observations;
        for (const char* end : {kSKNotificationSignInCompleted, kSKNotificationSignInFailed}) {
            observations.push_back(backend.center.addObserver(
                end, [&](const Notification& notification) { ending = notification.name; }));
        }
        backend.service.finishSignIn(name, password, {});
        while (ending.empty()) {
            backend.time.runLoops.current()->run(contract::tooLong);
        }
        return ending;
    }

    // A process of its own that switches a service and ends at once.
    //  result  its exit status
    int switchInAProcess(const std::string& identifier, const std::string& state) {
        std::vector<std::string> words = {WELCOMER_SWITCH_SERVICE, backend.embedded.root.path(), "bert",
                                          identifier, state};
        std::vector<char*> arguments;
        for (std::string& word : words) {
            arguments.push_back(word.data());
        }
        arguments.push_back(nullptr);
        pid_t process = 0;
        if (::posix_spawn(&process, arguments[0], nullptr, nullptr, arguments.data(), environ) != 0) {
            return -1;
        }
        int status = 0;
        ::waitpid(process, &status, 0);
        return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
    }

    std::string storedAccounts() {
        std::ifstream file(backend.session.home() + "/.config/goa-1.0/accounts.conf");
        return {std::istreambuf_iterator<char>(file), {}};
    }

    OnlineAccountsOf<Session, LocalTime> backend;
};

using OnlineAccountDaemon = OnTheDaemon<RunningOnlineAccounts>;

} // namespace welcomer
