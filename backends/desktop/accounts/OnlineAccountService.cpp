#include "backends/desktop/accounts/OnlineAccountService.h"

#include <algorithm>
#include <array>
#include <atomic>
#include <cstddef>
#include <optional>
#include <utility>

namespace welcomer::desktop {

namespace {

constexpr char kMailProvider[] = "imap_smtp";

// By OnlineFeature: the cloud service that it stands for.
constexpr std::array<const char*, kOnlineFeatureCount> kServices = {
    platform::kSKServiceIDContacts, platform::kSKServiceIDCalendars, platform::kSKServiceMobileDocuments,
    platform::kSKServiceIDMail};

// The feature that stands for a cloud service; none for a service that the online accounts do not know.
std::optional<OnlineFeature> featureOf(const std::string& service) {
    const auto* const found = std::find(kServices.begin(), kServices.end(), service);
    return found == kServices.end() ? std::nullopt
                                    : std::optional(static_cast<OnlineFeature>(found - kServices.begin()));
}

const char* serviceOf(OnlineFeature feature) {
    return kServices[static_cast<std::size_t>(feature)];
}

bool looksLikeMailAddress(const std::string& text) {
    const std::size_t at = text.find('@');
    return at != std::string::npos && at > 0 && at + 1 < text.size();
}

bool isText(const std::optional<PropertyList>& value) {
    return value && value->isString() && !value->string()->empty();
}

} // namespace

class OnlineAccountService::Switches {
  public:
    Switches(const OnlineAccountSurroundings& surroundings, std::function<OnlineAccountServer()> server)
        : _onlineAccounts(surroundings.onlineAccounts),
          _server(std::move(server)),
          _pending(surroundings.preferenceStore) {}

    const PendingSwitches& pending() const { return _pending; }

    // The online account that has the switch of a cloud account's service.
    std::optional<OnlineAccount> find(const std::string& name, OnlineFeature feature) const {
        return _findIn(_list(), name, feature);
    }

    // Sets the switch of a cloud account's service, where there is one. What cannot be set is in the account file all
    // the same, and is remembered.
    void set(const std::string& name, OnlineFeature feature, bool isOn) const {
        const std::string service = serviceOf(feature);
        const auto all = _list();
        if (!all) {
            if (_pending.isMade(name)) {
                _pending.note(name, service);
            }
            return;
        }
        const auto account = _findIn(all, name, feature);
        const bool isToBeSet = account && account->switchOf(feature).isOff == isOn;
        if (isToBeSet) {
            _pending.note(name, service); // before: this process may end meanwhile
        }
        OnlineAccounts* const accounts = _onlineAccounts();
        if (!isToBeSet || (accounts && accounts->setFeature(*account, feature, isOn))) {
            _pending.forget(name, service);
        }
    }

    // Sets the switches that are still to be set.
    //  embedded, account  say how, and whose
    void bringInLine(platform::AccountService& embedded, platform::CloudAccount& account) const {
        const std::string name = account.accountID();
        _pending.refresh();
        for (std::size_t i = 0; i < kServices.size(); ++i) {
            if (_pending.has(name, kServices[i])) {
                set(name, static_cast<OnlineFeature>(i), embedded.isServiceEnabled(&account, kServices[i]));
            }
        }
    }

    // Whether the online accounts are served and the cloud account has none.
    bool lack(const std::string& name) const {
        const auto all = _list();
        if (!all) {
            return false;
        }
        const std::string provider = _server().providerType;
        return std::none_of(all->begin(), all->end(), [&](const OnlineAccount& account) {
            return account.identity == name && account.providerType == provider;
        });
    }

    // On the cloud service's own server.
    bool makeOnce(NewOnlineAccount account) const {
        OnlineAccounts* const accounts = _onlineAccounts();
        if (!accounts) {
            return false;
        }
        OnlineAccountServer own = _server();
        account.providerType = std::move(own.providerType);
        account.serverAddress = std::move(own.address);
        return accounts->makeOnce(account);
    }

  private:
    std::optional<std::vector<OnlineAccount>> _list() const {
        OnlineAccounts* const accounts = _onlineAccounts();
        return accounts ? accounts->list() : std::nullopt;
    }

    std::optional<OnlineAccount> _findIn(std::optional<std::vector<OnlineAccount>> all,
                                         const std::string& name, OnlineFeature feature) const {
        std::optional<OnlineAccount> found;
        if (!all || all->empty()) {
            return found;
        }
        const std::string provider = feature == OnlineFeature::Mail ? kMailProvider : _server().providerType;
        for (OnlineAccount& account : *all) {
            if (account.identity == name && account.switchOf(feature).isKnown() &&
                (!found || (account.providerType == provider && found->providerType != provider))) {
                found = std::move(account);
            }
        }
        return found;
    }

    const std::function<OnlineAccounts*()> _onlineAccounts;
    const std::function<OnlineAccountServer()> _server;
    const PendingSwitches _pending;
};

class OnlineAccountService::Service final : public platform::CloudService {
  public:
    Service(std::shared_ptr<const Switches> switches, std::shared_ptr<platform::CloudService> embedded,
            std::string account, OnlineFeature feature)
        : _switches(std::move(switches)),
          _embedded(std::move(embedded)),
          _account(std::move(account)),
          _feature(feature) {}

    bool canBeEnabled() override { return _embedded->canBeEnabled(); }

    // A mail account that is switched off does not tell its address; its names may be one.
    std::optional<PropertyList> propertyValue(const std::string& key) override {
        std::optional<PropertyList> embedded = _embedded->propertyValue(key);
        if (_feature != OnlineFeature::Mail || key != platform::kSKPropertyMailEmailAddress) {
            return embedded;
        }
        const auto account = _switches->find(_account, _feature);
        if (!account || (account->mailAddress.empty() && isText(embedded))) {
            return embedded;
        }
        for (const std::string& text :
             {account->mailAddress, account->presentationIdentity, account->identity}) {
            if (looksLikeMailAddress(text)) {
                return PropertyList(text);
            }
        }
        return embedded;
    }

    void enableWithWindow(bool enabled, bool creating, platform::Window* window) override {
        _embedded->enableWithWindow(enabled, creating, window);
        _switches->set(_account, _feature, enabled);
    }

    void enableSilently(bool enabled) override {
        _embedded->enableSilently(enabled);
        _switches->set(_account, _feature, enabled);
    }

  private:
    const std::shared_ptr<const Switches> _switches;
    const std::shared_ptr<platform::CloudService> _embedded;
    const std::string _account;
    const OnlineFeature _feature;
};

class OnlineAccountService::Account final : public platform::CloudAccount {
  public:
    Account(std::shared_ptr<const Switches> switches, std::shared_ptr<platform::CloudAccount> embedded)
        : _switches(std::move(switches)),
          _embedded(std::move(embedded)) {}

    std::string accountID() override { return _embedded->accountID(); }

    void suppressFailureDialogs() override { _embedded->suppressFailureDialogs(); }

    std::shared_ptr<platform::CloudService> serviceForID(const std::string& identifier) override {
        auto service = _embedded->serviceForID(identifier);
        const auto feature = featureOf(identifier);
        if (!service || !feature) {
            return service;
        }
        return std::make_shared<Service>(_switches, std::move(service), accountID(), *feature);
    }

  private:
    const std::shared_ptr<const Switches> _switches;
    const std::shared_ptr<platform::CloudAccount> _embedded;
};

// One sign-in. The embedded service posts its end here; a completed one is passed on when the online account
// has been made. The embedded service is this one's own, so that no other notification comes here.
class OnlineAccountService::SignIn final : public platform::NotificationCenter,
                                           public std::enable_shared_from_this<SignIn> {
  public:
    SignIn(const OnlineAccountSurroundings& surroundings, std::shared_ptr<const Switches> switches,
           const std::string& username, const std::string& password)
        : _surroundings(surroundings),
          _switches(std::move(switches)),
          _identity(username),
          _password(std::in_place, password),
          _embedded(surroundings.makeEmbedded(*this)) {}

    void start(const PropertyList::Dictionary& delegateRequest) {
        _embedded->sharedManager().finishSignIn(_identity, _password->text(), delegateRequest);
    }

    bool isOver() const { return _isOver; }

    std::unique_ptr<platform::NotificationObservation> addObserver(const std::string& name,
                                                                   Observer observer) override {
        return _surroundings.notificationCenter.addObserver(name, std::move(observer));
    }

    // On the run loop of the thread that asked.
    void post(const platform::Notification& notification) override {
        if (notification.name != platform::kSKNotificationSignInCompleted) {
            _finish(notification);
            return;
        }
        NewOnlineAccount made{"", _identity, *_password, "", {}};
        const auto account = _embedded->sharedManager().accountForID(_identity, false);
        for (std::size_t i = 0; i < kServices.size(); ++i) {
            made.isOn[i] = _embedded->isServiceEnabled(account.get(), kServices[i]);
        }
        const std::shared_ptr<platform::RunLoop> runLoop = _surroundings.runLoops.current();
        const std::shared_ptr<platform::RunLoopPort> port = runLoop->attachPort();
        _surroundings.dispatchQueues.global().async([weak = weak_from_this(), switches = _switches,
                                                     made = std::optional(std::move(made)), runLoop, port,
                                                     notification]() mutable {
            // Taken out, so that the password does not stay with what the queue keeps.
            const bool isMade = switches->makeOnce(*std::exchange(made, std::nullopt));
            runLoop->perform([weak, port, notification, isMade] {
                if (const auto self = weak.lock()) {
                    if (isMade) {
                        self->_isMade();
                    }
                    self->_finish(notification);
                }
            });
        });
    }

  private:
    void _isMade() const {
        _switches->pending().setMade(_identity);
        // It may have been there before, and then begins with nothing.
        if (const auto account = _embedded->sharedManager().accountForID(_identity, false)) {
            _switches->bringInLine(*_embedded, *account);
        }
    }

    void _finish(const platform::Notification& notification) {
        _password.reset();
        _surroundings.notificationCenter.post(notification);
        _isOver = true; // an observer that starts the next sign-in must not end this one
    }

    const OnlineAccountSurroundings& _surroundings;
    const std::shared_ptr<const Switches> _switches;
    const std::string _identity;
    std::optional<posix::SecretText> _password; // until it is over
    const std::unique_ptr<platform::AccountService> _embedded;
    std::atomic<bool> _isOver{false};
};

OnlineAccountService::OnlineAccountService(OnlineAccountSurroundings surroundings,
                                           std::function<OnlineAccountServer()> server)
    : _surroundings(std::move(surroundings)),
      _switches(std::make_shared<Switches>(_surroundings, std::move(server))),
      _embedded(_surroundings.makeEmbedded(_surroundings.notificationCenter)) {}

OnlineAccountService::~OnlineAccountService() = default;

std::shared_ptr<platform::CloudAccount> OnlineAccountService::loggedInAccount() {
    auto account = _embedded->loggedInAccount();
    if (!account) {
        return nullptr;
    }
    const std::string name = account->accountID();
    return _switches->pending().isMade(name) && _switches->lack(name) ? nullptr : _wrap(std::move(account));
}

bool OnlineAccountService::isServiceEnabled(platform::CloudAccount* account, const std::string& identifier) {
    const bool isEnabled = _embedded->isServiceEnabled(account, identifier);
    const auto feature = featureOf(identifier);
    if (!account || !feature || !account->serviceForID(identifier)) {
        return isEnabled;
    }
    const auto online = _switches->find(account->accountID(), *feature);
    return online ? !online->switchOf(*feature).isOff : isEnabled;
}

std::shared_ptr<platform::CloudAccount>
OnlineAccountService::accountForID(const std::optional<PropertyList>& identifier, bool createIfMissing) {
    auto account = _embedded->sharedManager().accountForID(identifier, createIfMissing);
    if (account && createIfMissing) { // it is to be set up
        _switches->bringInLine(*_embedded, *account);
    }
    return _wrap(std::move(account));
}

void OnlineAccountService::authenticate(const std::string& username, const std::string& password,
                                        const PropertyList::Dictionary& delegateRequest) {
    _embedded->sharedManager().authenticate(username, password, delegateRequest);
}

void OnlineAccountService::finishSignIn(const std::string& username, const std::string& password,
                                        const PropertyList::Dictionary& delegateRequest) {
    const auto signIn = std::make_shared<SignIn>(_surroundings, _switches, username, password);
    {
        const std::lock_guard lock(_mutex);
        std::erase_if(_signIns, [](const std::shared_ptr<SignIn>& other) { return other->isOver(); });
        _signIns.push_back(signIn);
    }
    signIn->start(delegateRequest);
}

void OnlineAccountService::markSetupFinished(const std::optional<PropertyList>& information) {
    _embedded->sharedManager().markSetupFinished(information);
}

std::shared_ptr<platform::CloudAccount>
OnlineAccountService::_wrap(std::shared_ptr<platform::CloudAccount> embedded) const {
    return embedded ? std::make_shared<Account>(_switches, std::move(embedded)) : nullptr;
}

} // namespace welcomer::desktop
