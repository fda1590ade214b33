#include "tests/fakes/FakeAccountService.h"

#include "text/Describe.h"

#include <utility>

namespace welcomer::fakes {

namespace {

std::string yesNo(bool value) {
    return value ? "yes" : "no";
}

} // namespace

class FakeAccountService::Service : public platform::CloudService {
  public:
    Service(FakeAccountService& owner, std::string account, std::string identifier)
        : _owner(owner),
          _account(std::move(account)),
          _identifier(std::move(identifier)) {}

    bool canBeEnabled() override {
        _owner._recorder.record("CloudService.canBeEnabled " + _identifier);
        const std::lock_guard lock(_owner._mutex);
        return _state().canBeEnabled;
    }

    std::optional<PropertyList> propertyValue(const std::string& key) override {
        _owner._recorder.record("CloudService.propertyValue " + _identifier + ", " + key);
        const std::lock_guard lock(_owner._mutex);
        const PropertyList::Dictionary& properties = _state().properties;
        const auto found = properties.find(key);
        return found == properties.end() ? std::nullopt : std::optional(found->second);
    }

    void enableWithWindow(bool enabled, bool creating, platform::Window* window) override {
        _owner._recorder.record("CloudService.enableWithWindow " + _identifier + ", " + yesNo(enabled) +
                                ", " + yesNo(creating));
        const std::lock_guard lock(_owner._mutex);
        _owner.lastWindow = window;
        _state().enabled = enabled;
    }

    void enableSilently(bool enabled) override {
        _owner._recorder.record("CloudService.enableSilently " + _identifier + ", " + yesNo(enabled));
        const std::lock_guard lock(_owner._mutex);
        _state().enabled = enabled;
    }

  private:
    ServiceState& _state() { return _owner.accounts[_account][_identifier]; }

    FakeAccountService& _owner;
    std::string _account;
    std::string _identifier;
};

class FakeAccountService::Account : public platform::CloudAccount {
  public:
    Account(FakeAccountService& owner, std::string identifier)
        : _owner(owner),
          _identifier(std::move(identifier)) {}

    std::string accountID() override { return _identifier; }

    void suppressFailureDialogs() override { _owner._recorder.record("CloudAccount.suppressFailureDialogs"); }

    std::shared_ptr<platform::CloudService> serviceForID(const std::string& identifier) override {
        _owner._recorder.record("CloudAccount.serviceForID " + identifier);
        const std::lock_guard lock(_owner._mutex);
        if (!_owner.accounts[_identifier].contains(identifier)) {
            return nullptr;
        }
        return std::make_shared<Service>(_owner, _identifier, identifier);
    }

  private:
    FakeAccountService& _owner;
    std::string _identifier;
};

std::shared_ptr<platform::CloudAccount> FakeAccountService::loggedInAccount() {
    _recorder.record("AccountService.loggedInAccount");
    return loggedIn ? std::make_shared<Account>(*this, *loggedIn) : nullptr;
}

bool FakeAccountService::isServiceEnabled(platform::CloudAccount* account, const std::string& identifier) {
    _recorder.record("AccountService.isServiceEnabled " + (account ? account->accountID() : "(none)") + ", " +
                     identifier);
    if (!account) {
        return enabledWithoutAccount;
    }
    const std::lock_guard lock(_mutex);
    const Services& services = accounts[account->accountID()];
    const auto found = services.find(identifier);
    return found != services.end() && found->second.enabled;
}

std::shared_ptr<platform::CloudAccount>
FakeAccountService::accountForID(const std::optional<PropertyList>& identifier, bool createIfMissing) {
    _recorder.record("AccountManager.accountForID " + text::describe(identifier) + ", " +
                     yesNo(createIfMissing));
    const std::string* name = identifier ? identifier->string() : nullptr;
    if (!name || name->empty()) {
        return nullptr;
    }
    const std::lock_guard lock(_mutex);
    if (!accounts.contains(*name)) {
        if (!createIfMissing || !canCreateAccounts) {
            return nullptr;
        }
        accounts[*name] = servicesOfNewAccounts;
    }
    return std::make_shared<Account>(*this, *name);
}

void FakeAccountService::authenticate(const std::string& username, const std::string& password,
                                      const PropertyList::Dictionary& delegateRequest) {
    _recorder.record("AccountManager.authenticate " + username + ", " + password);
    lastRequest = delegateRequest;
    _answer(answerAuthenticate ? answerAuthenticate(username, password, delegateRequest)
                               : Answer{true, {{platform::kSKPropertyAccountID, username}}, {}, false},
            platform::kSKNotificationAuthenticationCompleted, platform::kSKNotificationAuthenticationFailed);
}

void FakeAccountService::finishSignIn(const std::string& username, const std::string& password,
                                      const PropertyList::Dictionary& delegateRequest) {
    _recorder.record("AccountManager.finishSignIn " + username + ", " + password);
    lastRequest = delegateRequest;
    const std::optional<Answer> answer =
        answerSignIn ? answerSignIn(username, password, delegateRequest)
                     : Answer{true, {{platform::kSKPropertyAccountID, username}}, {}, false};
    if (answer && answer->completed) {
        if (!accounts.contains(username)) {
            accounts[username] = servicesOfNewAccounts;
        }
        loggedIn = username;
    }
    _answer(answer, platform::kSKNotificationSignInCompleted, platform::kSKNotificationSignInFailed);
}

void FakeAccountService::_answer(std::optional<Answer> answer, const char* completedName,
                                 const char* failedName) {
    const std::shared_ptr<platform::RunLoop> loop = _runLoops.current();
    const std::shared_ptr<platform::RunLoopPort> port = loop->attachPort();
    if (!answer) {
        _endless.push_back(port);
        return;
    }
    const platform::Notification notification{answer->completed ? completedName : failedName, this,
                                              std::move(answer->contents)};
    if (answer->immediate) {
        _center.post(notification);
        return;
    }
    _queues.global().asyncAfter(answer->delay, [this, loop, port, notification] {
        loop->perform([this, port, notification] { _center.post(notification); });
    });
}

void FakeAccountService::markSetupFinished(const std::optional<PropertyList>& information) {
    _recorder.record("AccountManager.markSetupFinished " + text::describe(information));
}

} // namespace welcomer::fakes
