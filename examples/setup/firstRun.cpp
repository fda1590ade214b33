// The smallest setup application that does the whole job: it signs the user in, turns on the services that belong before the
// first login, and hands the rest over to the agent of that login. docs/integrators.md walks through it.
//
//   first-run [--root DIR] ACCOUNT BUNDLE    the password is the first line of stdin
//
// Run it as the user who is being set up. Everything happens on the main thread, which the calls turn the run loop of.

#include "backends/Backends.h"
#include "cloud/NimbusTesselDelegate.h"
#include "cloud/WLLoggedInNimbusAccount.h"
#include "cloud/WLNimbusServiceCatalogue.h"
#include "cloud/WLSetupProbes.h"
#include "handoff/ReplayItem.h"
#include "handoff/WLSetWelcomerNimbusReplayKeychainItemAndInstallWLNimbusSetup.h"
#include "plugins/DelegateIdentifiers.h"
#include "plugins/WLNimbusDelegatesRequest.h"

#include <iostream>
#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

namespace {

using namespace welcomer;

// What the server answered on behalf of one delegate, or null.
const PropertyList* responseOf(const NimbusTesselDelegate& signIn, const char* delegate) {
    const PropertyList::Dictionary& response = *signIn.delegatesResponseDict();
    const auto responses = response.find(platform::kDelegatesKey);
    return responses == response.end() ? nullptr : responses->second.find(delegate);
}

// Under which addresses people reach the user: a real program shows what is on offer and lets the user choose. This one
// takes them all.
void chooseAliases(const NimbusTesselDelegate& signIn, const char* delegate, const char* key,
                   PropertyList::Dictionary& replay) {
    const PropertyList* response = responseOf(signIn, delegate);
    if (!response) {
        return;
    }
    if (const auto offered = WLNimbusGetMessagingAliasesFromDelegateResponse(delegate, *response)) {
        replay[key] = PropertyList::Array(offered->begin(), offered->end());
    }
}

void setUp(const std::string& account, const std::string& password, const std::string& bundlePath) {
    // Somebody else's session: the two accounts would be taken for one another.
    const auto loggedIn = WLLoggedInNimbusAccount();
    if (loggedIn && loggedIn->accountID() != account) {
        throw std::runtime_error(loggedIn->accountID() + " is logged in already");
    }

    // 1 The server checks the password and answers each delegate's part of the request.
    NimbusTesselDelegate delegate;
    if (!delegate.signInWithUsernameAndPasswordAdditionalDelegatesOmittingDelegatesError(account, password,
                                                                                         {}, {}, nullptr)) {
        throw std::runtime_error(delegate.needsRepair()
                                     ? "the account needs the user's attention on the web"
                                     : "the server does not accept this name and password");
    }

    // 2 What the next login needs is put together before anything is set up.
    PropertyList::Dictionary replay{{kReplayResponsesKey, *delegate.delegatesResponseDict()}};
    chooseAliases(delegate, kVidlinkIdentifier, kReplayVidlinkAliasesKey, replay);
    chooseAliases(delegate, kChatterIdentifier, kReplayChatterAliasesKey, replay);

    // 3 The account is signed in for good, and the services that the user kept are turned on: here, all of them.
    const PropertyList::Dictionary setup{{platform::kSKPropertyAccountID, account}};
    if (!delegate.completeSetupWithUsernamePasswordNimbusDictionarySelectedServicesWindowError(
            account, password, setup, WLNimbusAllSetupServiceIDs(), nullptr, nullptr)) {
        throw std::runtime_error("the sign-in could not be completed");
    }

    // 4 The rest waits for the user's own login: an item in the credential store, and the agent that takes it.
    const auto bundle = platform::current().resourceBundles.open(bundlePath);
    platform::CredentialOutcome stored;
    if (!WLSetWelcomerNimbusReplayKeychainItemAndInstallWLNimbusSetup(account, replay, *bundle, stored)) {
        throw std::runtime_error("cannot hand over to the next login (the system log says why)");
    }

    // 5 The account service is told that nothing more comes.
    WLCallTesselFinishedSetup();
}

} // namespace

int main(int argc, char** argv) {
    PlatformOptions options;
    std::vector<std::string> arguments(argv + 1, argv + argc);
    if (arguments.size() >= 2 && arguments[0] == "--root") {
        options.root = arguments[1];
        arguments.erase(arguments.begin(), arguments.begin() + 2);
    }
    if (arguments.size() != 2) {
        std::cerr << "usage: first-run [--root DIR] ACCOUNT BUNDLE\n";
        return 2;
    }
    std::string password; // never an argument: the list of processes would show it to everybody
    std::getline(std::cin, password);

    // The platform comes first and goes last: everything else reaches the machine through it.
    const auto owner = buildPlatform(options);
    const platform::ScopedPlatform installed(owner->platform());
    try {
        setUp(arguments[0], password, arguments[1]);
    } catch (const std::exception& failure) {
        std::cerr << "first-run: " << failure.what() << '\n';
        return 1;
    }
    std::cout << arguments[0] << " is set up; the agent of the next login does the rest\n";
    return 0;
}
