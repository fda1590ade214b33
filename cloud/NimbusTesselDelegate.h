// Signing in to the cloud account, for the hosting setup application.

#pragma once

#include "platform/Error.h"
#include "platform/NotificationCenter.h"
#include "platform/Window.h"
#include "propertylist/PropertyList.h"

#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

namespace welcomer {

// Turns the account service's asynchronous operations into calls that block: each starts the operation, turns
// the calling thread's run loop in slices of 0.1 seconds until a notification has ended it, and interprets
// what came. There is no time limit. The notifications count whoever sends them.
//
// An object is meant for one validation or sign-in, then for the completion: a second validation or sign-in
// returns without waiting. All on one thread, which has a run loop. No error argument is ever written; each
// may be null.
class NimbusTesselDelegate {
  public:
    NimbusTesselDelegate() = default;
    NimbusTesselDelegate(const NimbusTesselDelegate&) = delete;
    NimbusTesselDelegate& operator=(const NimbusTesselDelegate&) = delete;

    // Checks the password, asking for the messaging aliases alone.
    //  result  `succeeded`
    bool validateNimbusUsernameAndPasswordError(const std::string& username, const std::string& password,
                                                platform::Error* error);

    // Checks the password.
    //  tosVersions  the versions of the terms of service that the user has accepted, or none; they join the
    //               delegates of the request and replace those of the same key
    //  delegates    the delegates request, or none for the one of every plug-in
    //  result       `succeeded`
    bool validateNimbusUsernameAndPasswordTosVersionsDelegatesError(
        const std::string& username, const std::string& password,
        const std::optional<PropertyList::Dictionary>& tosVersions,
        const std::optional<PropertyList::Dictionary>& delegates, platform::Error* error);

    // Checks the password with the request that makes everything ready for the completion.
    //  additionalDelegates  identifiers with their requests; they win over the plug-ins'
    //  omittingDelegates    the identifiers of delegates to leave out
    //  result               `succeeded`
    bool signInWithUsernameAndPasswordAdditionalDelegatesOmittingDelegatesError(
        const std::string& username, const std::string& password,
        const PropertyList::Dictionary& additionalDelegates,
        const std::vector<std::string>& omittingDelegates, platform::Error* error);

    // The completion below, for all of the account.
    bool completeSetupWithUsernamePasswordNimbusDictionarySelectedServicesWindowError(
        const std::string& username, const std::string& password,
        const PropertyList::Dictionary& nimbusDictionary, const std::vector<std::string>& selectedServices,
        const std::shared_ptr<platform::Window>& window, platform::Error* error);

    // Signs the user in, unless an account is logged in already, and enables the services that belong before
    // the first login.
    //  nimbusDictionary     the cloud setup dictionary, which goes with the sign-in
    //  selectedServices     the identifiers of the services that the user kept
    //  justTheAccountAndKVS enables documents and data alone
    //  window               see WLNimbusSetupWithDictionary2
    //  result               `succeeded`
    bool completeSetupWithUsernamePasswordNimbusDictionarySelectedServicesJustTheAccountAndKVSWindowError(
        const std::string& username, const std::string& password,
        const PropertyList::Dictionary& nimbusDictionary, const std::vector<std::string>& selectedServices,
        bool justTheAccountAndKVS, const std::shared_ptr<platform::Window>& window, platform::Error* error);

    // How the last operation ended.
    bool succeeded() const { return _succeeded; }

    // The server's response to the last validation or sign-in that left one, also to one that failed, or
    // none.
    const std::optional<PropertyList::Dictionary>& delegatesResponseDict() const {
        return _delegatesResponseDict;
    }

    // Whether the terms of service are to be accepted, or the account to be repaired. Never false again once
    // true.
    bool needsRepair() const { return _needsRepair; }

  private:
    void _validateOK(const platform::Notification& notification);
    void _validateNotOK(const platform::Notification& notification);
    void _processAuthenticateResponse();
    void _startObservingTesselNotificationsForOperation(const std::string& operation);
    void _stopObservingTesselNotificationsForOperation(const std::string& operation);
    void _waitUntilDone();

    bool _done = false; // an ending notification has come; a validation or sign-in does not clear it
    bool _succeeded = false;
    PropertyList::Dictionary _userInfo; // what the last ending notification said
    std::optional<PropertyList::Dictionary> _delegatesResponseDict;
    bool _needsRepair = false;

    // By the notification's name.
    std::vector<std::pair<std::string, std::unique_ptr<platform::NotificationObservation>>> _observations;
};

// How a delegate looks in a message: an object as <ClassName>.
std::string describe(const NimbusTesselDelegate& delegate);

} // namespace welcomer
