#include "tools/welcomer/story/SetupFlow.h"

#include "cloud/WLLoggedInNimbusAccount.h"
#include "cloud/WLSetupProbes.h"
#include "handoff/ReplayItem.h"
#include "handoff/WLSetWelcomerNimbusReplayKeychainItemAndInstallWLNimbusSetup.h"
#include "platform/Platform.h"
#include "plugins/DelegateIdentifiers.h"
#include "plugins/WLNimbusDelegatesRequest.h"
#include "propertylist/Lookup.h"
#include "propertylist/PropertyListReadings.h"
#include "propertylist/UnwritableValue.h"
#include "text/Describe.h"
#include "tools/welcomer/cli/StandardOutputGuard.h"
#include "tools/welcomer/story/ReplayReason.h"
#include "tools/welcomer/terminal/WaitingLine.h"

#include <algorithm>
#include <memory>
#include <optional>
#include <utility>

namespace welcomer::tool {

namespace {

const PropertyList* find(const PropertyList::Dictionary& dictionary, const char* key) {
    const auto found = dictionary.find(key);
    return found == dictionary.end() ? nullptr : &found->second;
}

std::string textOf(std::int64_t accountError) {
    switch (accountError) {
    case platform::kSKAccountErrorWrongPassword:
        return "the password is wrong";
    case platform::kSKAccountErrorUnknownUser:
        return "there is no such user";
    case platform::kSKAccountErrorTermsOfService:
        return "the terms of service are to be accepted first";
    case platform::kSKAccountErrorServerUnavailable:
        return "the server's directory of users is missing or cannot be read";
    case platform::kSKAccountErrorRepair:
        return "the account is to be repaired first";
    case platform::kSKAccountErrorNotStored:
        return "the account could not be stored";
    default:
        return "account error " + std::to_string(accountError);
    }
}

std::optional<std::int64_t> accountErrorOf(const PropertyList::Dictionary& response) {
    const PropertyList* error = find(response, platform::kSKPropertyAccountError);
    return error ? integerIn(*error) : std::nullopt;
}

// Why the account service refused, for people.
std::string refusal(const PropertyList::Dictionary& response) {
    const PropertyList* error = find(response, platform::kSKPropertyAccountError);
    if (!error) {
        return "the server gave no reason";
    }
    const std::optional<std::int64_t> code = integerIn(*error);
    if (!code) {
        return "the server's account error is no number: " + text::describe(*error);
    }
    const PropertyList* information = find(response, platform::kSKPropertyAccountErrorInfo);
    const std::string* const ownWords = information ? information->string() : nullptr;
    const bool saysWhy = *code == platform::kSKAccountErrorServerUnavailable ||
                         *code == platform::kSKAccountErrorWrongPassword;
    if (ownWords && saysWhy) {
        return *ownWords; // of a server that is asked over the network
    }
    return textOf(*code) + (information ? " (" + text::describe(*information) + ")" : "");
}

} // namespace

void SetupFlow::checkWhoIsLoggedIn(const std::string& account) {
    const auto loggedIn = WLLoggedInNimbusAccount();
    if (loggedIn && loggedIn->accountID() != account) {
        throw CommandFailure(loggedIn->accountID() + " is logged in to the cloud already");
    }
}

void SetupFlow::signIn(const std::string& account, const std::string& password) {
    const StandardOutputGuard guard;
    const WaitingLine waiting("Signing in", _showsWaiting);
    _account = account;
    _password.emplace(password);
    _delegate = std::make_unique<NimbusTesselDelegate>(); // one is meant for one sign-in
    if (!_delegate->signInWithUsernameAndPasswordAdditionalDelegatesOmittingDelegatesError(account, password,
                                                                                           {}, {}, nullptr)) {
        throw _signInFailure();
    }
}

void SetupFlow::acceptTerms(const platform::SignInDirectory& directory, const PropertyList& terms) const {
    const WaitingLine waiting("Accepting the terms of service", _showsWaiting);
    const platform::SignInAnswer answer = directory.acceptTerms(_account, _password->text(), terms);
    if (!answer.isCompleted) {
        throw _failure(answer.contents);
    }
}

std::vector<AliasOffer> SetupFlow::aliasOffers() {
    const StandardOutputGuard guard;
    std::vector<AliasOffer> offers{
        {kVidlinkIdentifier, "video calling", kReplayVidlinkAliasesKey, {}},
        {kChatterIdentifier, "messaging", kReplayChatterAliasesKey, {}},
    };
    std::erase_if(offers, [this](AliasOffer& offer) {
        const PropertyList* response = _response(offer.identifier);
        const auto aliases =
            response ? WLNimbusGetMessagingAliasesFromDelegateResponse(offer.identifier, *response)
                     : std::nullopt;
        offer.aliases = aliases.value_or(std::vector<std::string>());
        return !aliases;
    });
    return offers;
}

std::vector<std::string> SetupFlow::delegates() {
    const StandardOutputGuard guard;
    std::vector<std::string> identifiers = WLNimbusAllDelegateIdentifiers();
    std::erase_if(identifiers, [this](const std::string& identifier) {
        return identifier == kSkylarkIdentifier || !_response(identifier);
    });
    std::ranges::sort(identifiers);
    return identifiers;
}

void SetupFlow::checkHandOver(const ChosenAliases& aliases) const {
    if (const auto unwritable = findUnwritableValue(_replayObject(aliases))) {
        throw CommandFailure("cannot hand over to the next login what the server answered: " + *unwritable);
    }
}

void SetupFlow::complete(const std::vector<std::string>& services, bool justTheAccountAndKVS) {
    const WaitingLine waiting("Setting up the account", _showsWaiting);
    std::string reason;
    const auto observation = platform::current().notificationCenter.addObserver(
        platform::kSKNotificationSignInFailed,
        [&](const platform::Notification& notification) { reason = refusal(notification.contents); });
    const PropertyList::Dictionary setup{{platform::kSKPropertyAccountID, _account}};
    if (!_delegate
             ->completeSetupWithUsernamePasswordNimbusDictionarySelectedServicesJustTheAccountAndKVSWindowError(
                 _account, _password->text(), setup, services, justTheAccountAndKVS, nullptr, nullptr)) {
        throw CommandFailure("the sign-in could not be completed: " +
                             (reason.empty() ? _log.reason() : reason));
    }
    _password.reset();
}

void SetupFlow::handOver(const ChosenAliases& aliases, platform::ResourceBundle& bundle) {
    platform::CredentialOutcome stored;
    if (!WLSetWelcomerNimbusReplayKeychainItemAndInstallWLNimbusSetup(_account, _replayObject(aliases),
                                                                      bundle, stored)) {
        throw CommandFailure("cannot hand over to the next login: " + storingReason(_log, stored));
    }
    WLCallTesselFinishedSetup();
}

PropertyList::Dictionary SetupFlow::_replayObject(const ChosenAliases& aliases) const {
    PropertyList::Dictionary replay{{kReplayResponsesKey, *_delegate->delegatesResponseDict()}};
    for (const auto& [identifier, key] : {std::pair{kVidlinkIdentifier, kReplayVidlinkAliasesKey},
                                          std::pair{kChatterIdentifier, kReplayChatterAliasesKey}}) {
        const auto chosen = aliases.find(identifier);
        if (chosen != aliases.end()) {
            replay[key] = PropertyList::Array(chosen->second.begin(), chosen->second.end());
        }
    }
    return replay;
}

SignInFailure SetupFlow::_failure(const PropertyList::Dictionary& response) const {
    const std::optional<std::int64_t> error = accountErrorOf(response);
    const PropertyList* const info = find(response, platform::kSKPropertyAccountErrorInfo);
    const bool asksForTerms = error == platform::kSKAccountErrorTermsOfService;
    return {"cannot sign in " + _account + ": " + refusal(response), error,
            asksForTerms ? copyOf(info) : std::nullopt};
}

SignInFailure SetupFlow::_signInFailure() const {
    const auto& response = _delegate->delegatesResponseDict();
    return response ? _failure(*response)
                    : SignInFailure("cannot sign in " + _account +
                                        ": the server answered with a status other than 0",
                                    std::nullopt);
}

const PropertyList* SetupFlow::_response(const std::string& delegate) const {
    const PropertyList* responses = find(*_delegate->delegatesResponseDict(), platform::kDelegatesKey);
    return responses ? responses->find(delegate) : nullptr;
}

} // namespace welcomer::tool
