#include "cloud/WLNimbusSetupWithDictionary.h"

#include "cloud/WLNimbusServiceCatalogue.h"
#include "log/PCLogManager.h"
#include "platform/Duration.h"
#include "platform/Platform.h"
#include "propertylist/Lookup.h"
#include "text/Contains.h"

#include <cstdint>
#include <functional>
#include <optional>
#include <utility>

namespace welcomer {

namespace {

using CloudService = std::shared_ptr<platform::CloudService>;

constexpr char kDebugPostLoginDelayDefault[] = "WLDebugPostLoginDelay";
constexpr double kPostLoginDelaySeconds = 3.0;

using text::contains;

void enable(platform::CloudService& service, const std::shared_ptr<platform::Window>& window) {
    if (window) {
        service.enableWithWindow(true, true, window.get());
    } else {
        service.enableSilently(true);
    }
}

double postLoginDelaySeconds() {
    const std::int64_t seconds =
        platform::current().preferenceStore.integerDefault(kDebugPostLoginDelayDefault);
    return seconds > 0 ? static_cast<double>(seconds) : kPostLoginDelaySeconds;
}

// A service that is spoken of by a name of its own.
struct NamedService {
    const char* identifier;
    const char* optedOut;
    const char* missing;
    const char* disabled;
    const char* enabling = nullptr; // none for mail, whose line has its address
};

constexpr NamedService kLocator{platform::kSKServiceIDLOC, "User opted out of Nimbus Locator",
                                "No Nimbus Locator service available to enable",
                                "Nimbus Locator cannot be enabled on this machine for this user.",
                                "Enabling Nimbus Locator"};
constexpr NamedService kMail{platform::kSKServiceIDMail, "User opted out of Nimbus Mail",
                             "No Nimbus Mail service available to enable",
                             "Nimbus Mail cannot be enabled on this machine for this user."};
constexpr NamedService kNotes{platform::kSKServiceIDNotes, "User opted out of Nimbus Notes",
                              "No Nimbus Notes service available to enable",
                              "Nimbus Notes cannot be enabled on this machine for this user.",
                              "Enabling Nimbus Notes"};
constexpr NamedService kDocuments{platform::kSKServiceMobileDocuments,
                                  "User opted out of Nimbus Documents & Data",
                                  "No Nimbus Documents & Data service available to enable",
                                  "Nimbus Documents & Data cannot be enabled on this machine for this user.",
                                  "Enabling Nimbus Documents & Data"};

// One pass over an account's services in one phase.
class ServicePass {
  public:
    ServicePass(platform::CloudAccount& account, const std::vector<std::string>& selectedServices,
                bool postLogin, const std::shared_ptr<platform::Window>& window)
        : _account(account),
          _selectedServices(selectedServices),
          _postLogin(postLogin),
          _window(window) {}

    void run() {
        for (const std::string& identifier : WLNimbusSyncServiceIDs()) {
            _setUpSyncService(identifier);
        }
        _setUp(kLocator);
        const std::optional<PropertyList> mailAddress = _setUpMail();
        _setUpNotes(mailAddress);
        _setUp(kDocuments);
    }

  private:
    bool _isSelected(const std::string& identifier) const { return contains(_selectedServices, identifier); }

    // Logs it when the service does not belong to this phase.
    bool _belongsToThisPhase(const std::string& identifier) const {
        if (contains(WLNimbusPostLoginServiceIDs(), identifier) == _postLogin) {
            return true;
        }
        // The phase in which the service belongs, which is the other one.
        WL_LOG("%@ should be configured %@", identifier, _postLogin ? "pre-login" : "post-login");
        return false;
    }

    void _setUpSyncService(const std::string& identifier) {
        if (!_isSelected(identifier)) {
            WL_LOG("User opted out of %@", identifier);
            return;
        }
        if (!_belongsToThisPhase(identifier)) {
            return;
        }
        CloudService service = _account.serviceForID(identifier);
        if (!service || !service->canBeEnabled()) {
            WL_LOG("Nimbus service '%@' cannot be enabled on this machine for this user.", identifier);
            return;
        }
        // Holds all that it needs: it may run after the pass has ended.
        std::function<void()> task = [identifier, window = _window, service = std::move(service)] {
            WL_LOG("Enabling Nimbus service '%@'", identifier);
            enable(*service, window);
        };
        if (_postLogin && contains(WLNimbusDelayedServiceIDs(), identifier)) {
            const double delay = postLoginDelaySeconds();
            WL_LOG("Enabling '%@' after a %0.2f second delay", identifier, delay);
            platform::current().dispatchQueues.global().asyncAfter(platform::nanosecondsOf(delay),
                                                                   std::move(task));
        } else {
            task();
        }
    }

    // Logs it when the user does not want the service, or it does not belong to this phase.
    bool _isWanted(const NamedService& named) const {
        if (!_isSelected(named.identifier)) {
            WL_LOG("%@", named.optedOut);
            return false;
        }
        return _belongsToThisPhase(named.identifier);
    }

    void _setUp(const NamedService& named) {
        if (_isWanted(named)) {
            _enableIfPossible(named);
        }
    }

    void _enableIfPossible(const NamedService& named) {
        const CloudService service = _account.serviceForID(named.identifier);
        if (!service) {
            WL_LOG("%@", named.missing);
        } else if (!service->canBeEnabled()) {
            WL_LOG("%@", named.disabled);
        } else {
            WL_LOG("%@", named.enabling);
            enable(*service, _window);
        }
    }

    // Gives the mail service's address whenever it was read, also when mail is not enabled then.
    std::optional<PropertyList> _setUpMail() {
        if (!_isWanted(kMail)) {
            return std::nullopt;
        }
        const CloudService service = _account.serviceForID(kMail.identifier);
        if (!service) {
            WL_LOG("%@", kMail.missing);
            return std::nullopt;
        }
        std::optional<PropertyList> address = service->propertyValue(platform::kSKPropertyMailEmailAddress);
        const std::string* addressText = address ? address->string() : nullptr;
        if (!service->canBeEnabled()) {
            WL_LOG("%@", kMail.disabled);
        } else if (addressText && !addressText->empty()) {
            WL_LOG("Enabling Nimbus Mail: %@", *addressText);
            enable(*service, _window);
        } else {
            WL_LOG("Could not enable Nimbus Mail, no address specified by SKService");
        }
        return address;
    }

    // The mail address counts as soon as there is one, also when it is empty.
    void _setUpNotes(const std::optional<PropertyList>& mailAddress) {
        if (!_isWanted(kNotes)) {
            return;
        }
        if (!mailAddress) {
            WL_LOG("Cannot enable Nimbus notes without associated email address");
            return;
        }
        _enableIfPossible(kNotes);
    }

    platform::CloudAccount& _account;
    const std::vector<std::string>& _selectedServices;
    const bool _postLogin;
    const std::shared_ptr<platform::Window>& _window;
};

// Whether the service says that it can be enabled is asked for the log alone.
void enableDocumentsOnly(platform::CloudAccount& account, const std::shared_ptr<platform::Window>& window) {
    const CloudService service = account.serviceForID(platform::kSKServiceMobileDocuments);
    if (!service || !service->canBeEnabled()) {
        WL_LOG("Warning: Documents Service claims it cannot be enabled, trying anyway");
    }
    if (service) {
        enable(*service, window);
    }
}

} // namespace

bool WLNimbusSetupWithDictionary2(const PropertyList::Dictionary& setupDictionary,
                                  const std::vector<std::string>& selectedServices,
                                  bool accountAndKeyValueStoreOnly, bool postLogin,
                                  const std::shared_ptr<platform::Window>& window,
                                  [[maybe_unused]] platform::Error* errorOut) {
    const std::shared_ptr<platform::CloudAccount> account =
        platform::current().accountService.sharedManager().accountForID(
            copyOf(valueIn(setupDictionary, platform::kSKPropertyAccountID)), true);
    if (!account) {
        WL_LOG("Failed to retrieve SK_Account");
        return false;
    }
    account->suppressFailureDialogs();
    if (accountAndKeyValueStoreOnly) {
        enableDocumentsOnly(*account, window);
    } else {
        ServicePass(*account, selectedServices, postLogin, window).run();
    }
    return true;
}

bool WLNimbusSetupWithDictionary(const PropertyList::Dictionary& setupDictionary,
                                 const std::vector<std::string>& selectedServices,
                                 const std::shared_ptr<platform::Window>& window) {
    return WLNimbusSetupWithDictionary2(setupDictionary, selectedServices, false, false, window, nullptr);
}

} // namespace welcomer
