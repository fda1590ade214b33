#include "cloud/NimbusTesselDelegate.h"

#include "cloud/WLLoggedInNimbusAccount.h"
#include "cloud/WLNimbusSetupWithDictionary.h"
#include "cloud/WLSetupProbes.h"
#include "log/PCLogManager.h"
#include "platform/Platform.h"
#include "plugins/PluginContext.h"
#include "plugins/WLNimbusDelegatesRequest.h"
#include "propertylist/Lookup.h"
#include "propertylist/PropertyListReadings.h"

#include <chrono>

namespace welcomer {

namespace {

using namespace std::chrono_literals;

constexpr std::chrono::nanoseconds kRunLoopSlice = 100ms;

constexpr char kValidateOperation[] = "validate";
constexpr char kSignInOperation[] = "sign-in";
constexpr char kCompleteSignInOperation[] = "complete-sign-in";

// The notifications that end an operation.
struct EndingNotifications {
    std::string completed;
    std::string failed;
};

std::optional<EndingNotifications> endingNotifications(const std::string& operation) {
    if (operation == kValidateOperation || operation == kSignInOperation) {
        return EndingNotifications{platform::kSKNotificationAuthenticationCompleted,
                                   platform::kSKNotificationAuthenticationFailed};
    }
    if (operation == kCompleteSignInOperation) {
        return EndingNotifications{platform::kSKNotificationSignInCompleted,
                                   platform::kSKNotificationSignInFailed};
    }
    return std::nullopt;
}

// The request with more entries among its delegates.
PropertyList::Dictionary addToDelegates(PropertyList::Dictionary request,
                                        const PropertyList::Dictionary& additions) {
    PropertyList::Dictionary delegates =
        copyOf(dictionaryIn(request, platform::kDelegatesKey)).value_or(PropertyList::Dictionary());
    for (const auto& [key, value] : additions) {
        delegates.insert_or_assign(key, value);
    }
    request.insert_or_assign(platform::kDelegatesKey, std::move(delegates));
    return request;
}

// What the log may show of a notification.
std::string loggableContents(const platform::Notification& notification) {
    return WLShouldLogDelegateResponses() ? text::describe(PropertyList(notification.contents)) : "";
}

} // namespace

std::string describe(const NimbusTesselDelegate& /*delegate*/) {
    return "<NimbusTesselDelegate>";
}

bool NimbusTesselDelegate::validateNimbusUsernameAndPasswordError(const std::string& username,
                                                                  const std::string& password,
                                                                  platform::Error* error) {
    return validateNimbusUsernameAndPasswordTosVersionsDelegatesError(
        username, password, std::nullopt, WLNimbusCreateOrLoginDelegatesRequestForMessagingAliases(), error);
}

bool NimbusTesselDelegate::validateNimbusUsernameAndPasswordTosVersionsDelegatesError(
    const std::string& username, const std::string& password,
    const std::optional<PropertyList::Dictionary>& tosVersions,
    const std::optional<PropertyList::Dictionary>& delegates, [[maybe_unused]] platform::Error* error) {
    WL_LOG("%@: %s %@", *this,
           "-[NimbusTesselDelegate validateNimbusUsername:andPassword:tosVersions:delegates:error:]",
           username);
    _startObservingTesselNotificationsForOperation(kValidateOperation);
    setPluginAccount(username);
    PropertyList::Dictionary request = delegates ? *delegates : WLNimbusDelegatesRequest({}, {});
    if (tosVersions) {
        request = addToDelegates(std::move(request), *tosVersions);
    }
    platform::current().accountService.sharedManager().authenticate(username, password, request);
    _waitUntilDone();
    _stopObservingTesselNotificationsForOperation(kValidateOperation);
    _processAuthenticateResponse();
    return _succeeded;
}

bool NimbusTesselDelegate::signInWithUsernameAndPasswordAdditionalDelegatesOmittingDelegatesError(
    const std::string& username, const std::string& password,
    const PropertyList::Dictionary& additionalDelegates, const std::vector<std::string>& omittingDelegates,
    [[maybe_unused]] platform::Error* error) {
    setPluginAccount(username);
    const PropertyList::Dictionary request = WLNimbusDelegatesRequest(additionalDelegates, omittingDelegates);
    WL_LOG(
        "%@: %s %@ - *", *this,
        "-[NimbusTesselDelegate signInWithUsername:andPassword:additionalDelegates:omittingDelegates:error:]",
        username);
    WL_LOG("%@: 'uber' request: %@", *this, PropertyList(request));
    _startObservingTesselNotificationsForOperation(kSignInOperation);
    platform::current().accountService.sharedManager().authenticate(username, password, request);
    _waitUntilDone();
    _stopObservingTesselNotificationsForOperation(kSignInOperation);
    _processAuthenticateResponse();
    return _succeeded;
}

bool NimbusTesselDelegate::completeSetupWithUsernamePasswordNimbusDictionarySelectedServicesWindowError(
    const std::string& username, const std::string& password,
    const PropertyList::Dictionary& nimbusDictionary, const std::vector<std::string>& selectedServices,
    const std::shared_ptr<platform::Window>& window, platform::Error* error) {
    return completeSetupWithUsernamePasswordNimbusDictionarySelectedServicesJustTheAccountAndKVSWindowError(
        username, password, nimbusDictionary, selectedServices, false, window, error);
}

bool NimbusTesselDelegate::
    completeSetupWithUsernamePasswordNimbusDictionarySelectedServicesJustTheAccountAndKVSWindowError(
        const std::string& username, const std::string& password,
        const PropertyList::Dictionary& nimbusDictionary, const std::vector<std::string>& selectedServices,
        bool justTheAccountAndKVS, const std::shared_ptr<platform::Window>& window,
        [[maybe_unused]] platform::Error* error) {
    WL_LOG("%@: %s %@ - *", *this,
           "-[NimbusTesselDelegate "
           "completeSetupWithUsername:password:nimbusDictionary:selectedServices:justTheAccountAndKVS:window:"
           "error:]",
           username);
    if (WLHasLoggedInNimbusAccount()) {
        _userInfo = {{platform::kSKPropertyAccountID, username}};
        _succeeded = true;
    } else {
        _done = false;
        _startObservingTesselNotificationsForOperation(kCompleteSignInOperation);
        platform::current().accountService.sharedManager().finishSignIn(username, password, nimbusDictionary);
        _waitUntilDone();
        _stopObservingTesselNotificationsForOperation(kCompleteSignInOperation);
    }
    if (_succeeded) {
        _succeeded = WLNimbusSetupWithDictionary2(_userInfo, selectedServices, justTheAccountAndKVS, false,
                                                  window, nullptr);
    }
    return _succeeded;
}

void NimbusTesselDelegate::_validateOK(const platform::Notification& notification) {
    WL_LOG("%@: _validateOK: %@", *this, loggableContents(notification));
    _userInfo = notification.contents;
    _succeeded = true;
    _done = true;
}

void NimbusTesselDelegate::_validateNotOK(const platform::Notification& notification) {
    WL_LOG("%@: _validateNotOK: %@", *this, loggableContents(notification));
    _userInfo = notification.contents;
    _succeeded = false;
    _done = true;
}

void NimbusTesselDelegate::_processAuthenticateResponse() {
    if (_succeeded) {
        // A status that is there and is no number is none that says success.
        const PropertyList* const status = valueIn(_userInfo, platform::kStatusKey);
        if (!status || integerIn(*status) == 0) {
            _delegatesResponseDict = _userInfo;
        } else {
            _succeeded = false;
        }
        return;
    }
    _delegatesResponseDict = _userInfo;
    const PropertyList* const accountError = valueIn(_userInfo, platform::kSKPropertyAccountError);
    if (!accountError) {
        WL_LOG("Nimbus: No accountError for validate failure");
        return;
    }
    const std::optional<std::int64_t> code = integerIn(*accountError);
    if (!code) {
        WL_LOG("Nimbus: accountError '%@' for validate failure is no number", *accountError);
        return;
    }
    switch (*code) {
    case platform::kSKAccountErrorTermsOfService:
    case platform::kSKAccountErrorRepair:
        if (_userInfo.contains(platform::kSKPropertyAccountErrorInfo)) {
            WL_LOG("Nimbus: Account needs TOS/Repair");
            _needsRepair = true;
        } else {
            WL_LOG("Nimbus: no error info for TOS/Repair response");
        }
        break;
    case platform::kSKAccountErrorNone:
        WL_LOG("Nimbus: validation 'NoError'");
        _succeeded = true;
        break;
    default:
        break;
    }
}

void NimbusTesselDelegate::_startObservingTesselNotificationsForOperation(const std::string& operation) {
    const std::optional<EndingNotifications> names = endingNotifications(operation);
    if (!names) {
        return;
    }
    platform::NotificationCenter& center = platform::current().notificationCenter;
    _observations.emplace_back(names->completed,
                               center.addObserver(names->completed, [this](const auto& notification) {
                                   _validateOK(notification);
                               }));
    _observations.emplace_back(names->failed,
                               center.addObserver(names->failed, [this](const auto& notification) {
                                   _validateNotOK(notification);
                               }));
}

void NimbusTesselDelegate::_stopObservingTesselNotificationsForOperation(const std::string& operation) {
    const std::optional<EndingNotifications> names = endingNotifications(operation);
    if (!names) {
        return;
    }
    std::erase_if(_observations, [&](const auto& observation) {
        return observation.first == names->completed || observation.first == names->failed;
    });
}

void NimbusTesselDelegate::_waitUntilDone() {
    while (!_done) {
        platform::current().runLoops.current()->run(kRunLoopSlice);
    }
}

} // namespace welcomer
