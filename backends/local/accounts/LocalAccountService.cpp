#include "backends/local/accounts/LocalAccountService.h"

#include "backends/posix/SecretText.h"
#include "platform/Duration.h"
#include "propertylist/Lookup.h"
#include "propertylist/PropertyListReadings.h"

#include <optional>
#include <type_traits>
#include <utility>

namespace welcomer::local {

namespace {

constexpr char kSetupFinishedKey[] = "SetupFinished";
constexpr char kServicesKey[] = "Services";
constexpr char kCanBeEnabledKey[] = "CanBeEnabled";
constexpr char kEnabledKey[] = "Enabled";
constexpr char kPropertiesKey[] = "Properties";

// The dictionary under a key, made where it is missing or something else.
PropertyList::Dictionary& makeDictionary(PropertyList::Dictionary& parent, const std::string& key) {
    PropertyList& value = parent[key];
    if (!value.isDictionary()) {
        value = PropertyList::Dictionary{};
    }
    return *value.dictionary();
}

template <typename Content>
Content* findAccount(Content& content, const std::string& name) {
    return dictionaryIn(dictionaryIn(content, kAccountsKey), name);
}

template <typename Content>
Content* findService(Content& content, const std::string& name, const std::string& identifier) {
    return dictionaryIn(dictionaryIn(findAccount(content, name), kServicesKey), identifier);
}

// What is there and reads as no boolean is false.
bool flag(const PropertyList::Dictionary& dictionary, const char* key, bool ifMissing) {
    const PropertyList* const found = valueIn(dictionary, key);
    return found ? booleanReading(*found) : ifMissing;
}

} // namespace

struct LocalAccountService::Accounts {
    Accounts(const posix::RootFolder& root, platform::ProcessIdentity& identity, platform::SystemLog& log,
             const platform::SignInDirectory* replacement)
        : file(root, identity, log),
          machines(root),
          directory(replacement ? *replacement : machines) {}

    AccountFile file;
    const NimbusDirectory machines;
    const platform::SignInDirectory& directory;

    // Makes an account where it is missing, and then does more to the content, all in one change.
    platform::Outcome make(
        const std::string& name,
        const std::function<void(PropertyList::Dictionary&)>& more = [](PropertyList::Dictionary&) {}) {
        return file.change([&](PropertyList::Dictionary& content) {
            if (!findAccount(content, name)) {
                makeDictionary(content, kAccountsKey)[name] =
                    PropertyList::Dictionary{{kServicesKey, directory.servicesOfNewAccount(name)}};
            }
            more(content);
            return true;
        });
    }
};

class LocalAccountService::Service final : public platform::CloudService {
  public:
    Service(std::shared_ptr<Accounts> accounts, std::string account, std::string identifier)
        : _accounts(std::move(accounts)),
          _account(std::move(account)),
          _identifier(std::move(identifier)) {}

    bool canBeEnabled() override {
        return _ask([](const PropertyList::Dictionary* service) {
            return service && flag(*service, kCanBeEnabledKey, true);
        });
    }

    std::optional<PropertyList> propertyValue(const std::string& key) override {
        return _ask([&](const PropertyList::Dictionary* service) {
            return copyOf(valueIn(dictionaryIn(service, kPropertiesKey), key));
        });
    }

    void enableWithWindow(bool enabled, bool /*creating*/, platform::Window* /*window*/) override {
        enableSilently(enabled);
    }

    void enableSilently(bool enabled) override {
        // What became of it is not reported; the file tells the system log.
        static_cast<void>(_accounts->file.change([&](PropertyList::Dictionary& content) {
            PropertyList::Dictionary* service = findService(content, _account, _identifier);
            if (!service || flag(*service, kEnabledKey, false) == enabled) {
                return false; // nothing to store
            }
            (*service)[kEnabledKey] = enabled;
            return true;
        }));
    }

  private:
    // Asks something of the service's dictionary, null where it has gone.
    template <typename Question>
    std::invoke_result_t<Question, const PropertyList::Dictionary*> _ask(const Question& question) {
        return _accounts->file.ask([&](const PropertyList::Dictionary& content) {
            return question(findService(content, _account, _identifier));
        });
    }

    const std::shared_ptr<Accounts> _accounts;
    const std::string _account;
    const std::string _identifier;
};

class LocalAccountService::Account final : public platform::CloudAccount {
  public:
    Account(std::shared_ptr<Accounts> accounts, std::string name)
        : _accounts(std::move(accounts)),
          _name(std::move(name)) {}

    std::string accountID() override { return _name; }

    void suppressFailureDialogs() override {
        // There are none to suppress.
    }

    std::shared_ptr<platform::CloudService> serviceForID(const std::string& identifier) override {
        const bool isPresent = _accounts->file.ask([&](const PropertyList::Dictionary& content) {
            return findService(content, _name, identifier) != nullptr;
        });
        return isPresent ? std::make_shared<Service>(_accounts, _name, identifier) : nullptr;
    }

  private:
    const std::shared_ptr<Accounts> _accounts;
    const std::string _name;
};

// One authentication or sign-in that is under way.
struct LocalAccountService::Operation {
    Operation(std::string user, const std::string& secret, PropertyList::Dictionary request, bool signsIn,
              std::shared_ptr<Accounts> on)
        : username(std::move(user)),
          password(std::in_place, secret),
          delegateRequest(std::move(request)),
          isSignIn(signsIn),
          accounts(std::move(on)) {}

    const std::string username;
    std::optional<posix::SecretText> password; // none once it has been checked
    const PropertyList::Dictionary delegateRequest;
    const bool isSignIn;
    const std::shared_ptr<Accounts> accounts;
    std::shared_ptr<platform::RunLoop> runLoop;  // of the thread that started it
    std::shared_ptr<platform::RunLoopPort> port; // keeps that loop waiting for the answer

    // Each on a thread of the global queue.
    platform::SignInAnswer ask() {
        platform::SignInAnswer answer =
            accounts->directory.answer(username, password->text(), delegateRequest);
        password.reset();
        return answer;
    }
    platform::Notification notification(const platform::SignInAnswer& answer) {
        platform::Notification result{_name(answer.isCompleted), nullptr, answer.contents};
        const auto logIn = [this](PropertyList::Dictionary& content) {
            content[kLoggedInAccountKey] = username;
        };
        if (!isSignIn || !answer.isCompleted) {
            return result;
        }
        if (const platform::Outcome outcome = accounts->make(username, logIn); !outcome) {
            result.name = _name(false);
            result.contents = {{platform::kSKPropertyAccountError, platform::kSKAccountErrorNotStored},
                               {platform::kSKPropertyAccountErrorInfo, outcome.error.message}};
        }
        return result;
    }

  private:
    const char* _name(bool isCompleted) const {
        if (isSignIn) {
            return isCompleted ? platform::kSKNotificationSignInCompleted
                               : platform::kSKNotificationSignInFailed;
        }
        return isCompleted ? platform::kSKNotificationAuthenticationCompleted
                           : platform::kSKNotificationAuthenticationFailed;
    }
};

LocalAccountService::LocalAccountService(const posix::RootFolder& root, platform::ProcessIdentity& identity,
                                         platform::RunLoops& runLoops,
                                         platform::DispatchQueues& dispatchQueues,
                                         platform::NotificationCenter& notificationCenter,
                                         platform::SystemLog& log, const platform::SignInDirectory* directory)
    : _accounts(std::make_shared<Accounts>(root, identity, log, directory)),
      _runLoops(runLoops),
      _dispatchQueues(dispatchQueues),
      _notificationCenter(notificationCenter),
      _isAlive(std::make_shared<bool>(true)) {}

std::shared_ptr<platform::CloudAccount> LocalAccountService::loggedInAccount() {
    const auto name = _accounts->file.ask([](const PropertyList::Dictionary& content) {
        const std::string* const text = textIn(content, kLoggedInAccountKey);
        return text && findAccount(content, *text) ? std::optional(*text) : std::nullopt;
    });
    return name ? std::make_shared<Account>(_accounts, *name) : nullptr;
}

bool LocalAccountService::isServiceEnabled(platform::CloudAccount* account, const std::string& identifier) {
    if (!account) {
        return false;
    }
    const std::string name = account->accountID();
    return _accounts->file.ask([&](const PropertyList::Dictionary& content) {
        const auto* service = findService(content, name, identifier);
        return service && flag(*service, kEnabledKey, false);
    });
}

std::shared_ptr<platform::CloudAccount>
LocalAccountService::accountForID(const std::optional<PropertyList>& identifier, bool createIfMissing) {
    const std::string* name = identifier ? identifier->string() : nullptr;
    if (!name || name->empty()) {
        return nullptr;
    }
    const bool isThere = _accounts->file.ask(
        [&](const PropertyList::Dictionary& content) { return findAccount(content, *name) != nullptr; });
    if (!isThere && (!createIfMissing || !_accounts->make(*name))) {
        return nullptr;
    }
    return std::make_shared<Account>(_accounts, *name);
}

void LocalAccountService::authenticate(const std::string& username, const std::string& password,
                                       const PropertyList::Dictionary& delegateRequest) {
    _start(std::make_shared<Operation>(username, password, delegateRequest, false, _accounts));
}

void LocalAccountService::finishSignIn(const std::string& username, const std::string& password,
                                       const PropertyList::Dictionary& delegateRequest) {
    _start(std::make_shared<Operation>(username, password, delegateRequest, true, _accounts));
}

void LocalAccountService::markSetupFinished(const std::optional<PropertyList>& /*information*/) {
    static_cast<void>(_accounts->file.change([](PropertyList::Dictionary& content) {
        content[kSetupFinishedKey] = true;
        return true;
    }));
}

void LocalAccountService::_start(const std::shared_ptr<Operation>& operation) {
    operation->runLoop = _runLoops.current();
    operation->port = operation->runLoop->attachPort();
    // On the loop's thread, which is this object's for as long as it lives.
    const auto deliver = [this, isAlive = std::weak_ptr(_isAlive),
                          operation](const platform::Notification& notification) {
        operation->port.reset();
        if (!isAlive.expired()) {
            _notificationCenter.post(notification);
        }
    };
    platform::DispatchQueue& queue = _dispatchQueues.global();
    queue.async([&queue, operation, deliver, sender = static_cast<const void*>(this)] {
        const platform::SignInAnswer answer = operation->ask();
        queue.asyncAfter(platform::nanosecondsOf(answer.delaySeconds), [operation, deliver, sender, answer] {
            platform::Notification notification = operation->notification(answer);
            notification.sender = sender;
            operation->runLoop->perform([deliver, notification] { deliver(notification); });
        });
    });
}

} // namespace welcomer::local
