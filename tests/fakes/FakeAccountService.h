// Accounts in memory.

#pragma once

#include "platform/AccountService.h"
#include "platform/DispatchQueue.h"
#include "platform/NotificationCenter.h"
#include "platform/RunLoop.h"
#include "tests/fakes/CallRecorder.h"

#include <chrono>
#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

namespace welcomer::fakes {

// Recorded as "AccountManager.accountForID name, yes", "CloudService.enableSilently identifier, yes" and so
// on; passwords as given, so that a test can tell where one went.
class FakeAccountService final : public platform::AccountService, public platform::AccountManager {
  public:
    // What an account has under one service identifier.
    struct ServiceState {
        bool canBeEnabled = true;
        bool enabled = false;
        PropertyList::Dictionary properties;
    };
    using Services = std::map<std::string, ServiceState>;

    // How an authentication or a sign-in ends.
    struct Answer {
        bool completed = true; // or failed
        PropertyList::Dictionary contents;
        std::chrono::nanoseconds delay{0};
        bool immediate = false; // posted before the operation returns, without the run loop
    };
    using Answerer = std::function<std::optional<Answer>(
        const std::string& username, const std::string& password, const PropertyList::Dictionary& request)>;

    FakeAccountService(CallRecorder& recorder, platform::NotificationCenter& center,
                       platform::RunLoops& runLoops, platform::DispatchQueues& queues)
        : _recorder(recorder),
          _center(center),
          _runLoops(runLoops),
          _queues(queues) {}

    // The accounts that exist, what a new one gets, and who is logged in. Set between the calls.
    std::map<std::string, Services> accounts;
    Services servicesOfNewAccounts;
    bool canCreateAccounts = true;
    std::optional<std::string> loggedIn;

    // What answers; none for an operation that never ends. Without one every password is right.
    Answerer answerAuthenticate;
    Answerer answerSignIn;

    // What isServiceEnabled answers when there is no account.
    bool enabledWithoutAccount = false;

    platform::AccountManager& sharedManager() override { return *this; }

    std::shared_ptr<platform::CloudAccount> loggedInAccount() override;
    bool isServiceEnabled(platform::CloudAccount* account, const std::string& identifier) override;
    std::shared_ptr<platform::CloudAccount> accountForID(const std::optional<PropertyList>& identifier,
                                                         bool createIfMissing) override;
    void authenticate(const std::string& username, const std::string& password,
                      const PropertyList::Dictionary& delegateRequest) override;
    void finishSignIn(const std::string& username, const std::string& password,
                      const PropertyList::Dictionary& delegateRequest) override;
    void markSetupFinished(const std::optional<PropertyList>& information) override;

    // The request of the last authentication or sign-in.
    PropertyList::Dictionary lastRequest;

    // The window of the last enableWithWindow.
    platform::Window* lastWindow = nullptr;

  private:
    class Account;
    class Service;

    void _answer(std::optional<Answer> answer, const char* completedName, const char* failedName);

    CallRecorder& _recorder;
    platform::NotificationCenter& _center;
    platform::RunLoops& _runLoops;
    platform::DispatchQueues& _queues;
    std::vector<std::shared_ptr<platform::RunLoopPort>> _endless; // of operations that never end
    std::mutex _mutex; // guards the accounts: services are enabled from queues too
};

} // namespace welcomer::fakes
