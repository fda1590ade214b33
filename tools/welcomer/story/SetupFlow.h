// What a setup application does with the module, one step after the other.

#pragma once

#include "backends/posix/SecretText.h"
#include "cloud/NimbusTesselDelegate.h"
#include "platform/AccountService.h"
#include "platform/ResourceBundle.h"
#include "platform/SignInDirectory.h"
#include "tools/welcomer/cli/KeptLog.h"
#include "tools/welcomer/terminal/Failure.h"

#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

namespace welcomer::tool {

// The account service did not accept the user name and the password.
class SignInFailure : public CommandFailure {
  public:
    //  accountError  what the account service says, or none
    //  terms         what is to be accepted, with the account error for the terms of service
    SignInFailure(const std::string& reason, std::optional<std::int64_t> accountError,
                  std::optional<PropertyList> terms = std::nullopt)
        : CommandFailure(reason),
          _accountError(accountError),
          _terms(std::move(terms)) {}

    // Whether another password may help.
    bool isWrongPassword() const { return _accountError == platform::kSKAccountErrorWrongPassword; }

    // Whether another name may help.
    bool isUnknownUser() const { return _accountError == platform::kSKAccountErrorUnknownUser; }

    // The terms of service that are to be accepted first, for SetupFlow::acceptTerms(); or none.
    const std::optional<PropertyList>& terms() const { return _terms; }

  private:
    std::optional<std::int64_t> _accountError;
    std::optional<PropertyList> _terms;
};

// The aliases that the server offers one of the messaging delegates.
struct AliasOffer {
    const char* identifier; // the delegate's
    const char* purpose;    // "video calling"
    const char* replayKey;  // where the replay object keeps the chosen ones
    std::vector<std::string> aliases;
};

// The chosen aliases by delegate identifier.
using ChosenAliases = std::map<std::string, std::vector<std::string>>;

// The steps, to be called in their order; each throws CommandFailure with the reason. One thread, which has a
// run loop; the installed platform is used.
class SetupFlow {
  public:
    //  log           where the reasons of failures are read; borrowed
    //  showsWaiting  whether a terminal is shown what is waited for
    SetupFlow(const KeptLog& log, bool showsWaiting) : _log(log), _showsWaiting(showsWaiting) {}

    // Refuses to begin while somebody else is logged in to a cloud account: completing the setup would take
    // the one for the other.
    static void checkWhoIsLoggedIn(const std::string& account);

    // Has the server check the password and ask each delegate. Throws SignInFailure. May be called again
    // after that.
    void signIn(const std::string& account, const std::string& password);

    // Says that the user who could not sign in has accepted the terms of service. The next step is to sign in
    // again. Throws SignInFailure.
    //  terms  as the failure had them
    void acceptTerms(const platform::SignInDirectory& directory, const PropertyList& terms) const;

    // What there is to choose from, by delegate in a fixed order; delegates without a plug-in or a response
    // are left out.
    std::vector<AliasOffer> aliasOffers();

    // The identifiers of the delegates that have a plug-in and a response, in order.
    std::vector<std::string> delegates();

    // Refuses, before anything is set up, what the hand-over could not store: what the server answered or the
    // chosen aliases hold a value that cannot be written.
    void checkHandOver(const ChosenAliases& aliases) const;

    // Signs in for good, unless that is so already, and enables the selected pre-login services.
    //  services              their identifiers
    //  justTheAccountAndKVS  documents and data alone
    void complete(const std::vector<std::string>& services, bool justTheAccountAndKVS);

    // Stores the replay item, installs the agent for the next login, and tells the account service that setup
    // has finished.
    void handOver(const ChosenAliases& aliases, platform::ResourceBundle& bundle);

  private:
    PropertyList::Dictionary _replayObject(const ChosenAliases& aliases) const;
    SignInFailure _failure(const PropertyList::Dictionary& response) const;
    SignInFailure _signInFailure() const;
    const PropertyList* _response(const std::string& delegate) const;

    const KeptLog& _log;
    const bool _showsWaiting;
    std::string _account;
    std::optional<posix::SecretText> _password; // until the sign-in is complete
    std::unique_ptr<NimbusTesselDelegate> _delegate;
};

} // namespace welcomer::tool
