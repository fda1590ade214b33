// Cloud accounts whose services are switched on in the desktop's online accounts.

#pragma once

#include "backends/desktop/accounts/OnlineAccounts.h"
#include "backends/desktop/accounts/PendingSwitches.h"
#include "platform/AccountService.h"
#include "platform/DispatchQueue.h"
#include "platform/NotificationCenter.h"
#include "platform/PreferenceStore.h"
#include "platform/RunLoop.h"

#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <vector>

namespace welcomer::desktop {

// What the service stands on. Everything is borrowed and must outlive it.
struct OnlineAccountSurroundings {
    // The online accounts, or null where there are none. Called when they are first needed, and from then on.
    std::function<OnlineAccounts*()> onlineAccounts;

    // Makes the embedded account service, which posts to this centre: one for the service, and one for each
    // sign-in. All of them work on the same accounts.
    std::function<std::unique_ptr<platform::AccountService>(platform::NotificationCenter&)> makeEmbedded;
    platform::PreferenceStore& preferenceStore;
    platform::RunLoops& runLoops;
    platform::DispatchQueues& dispatchQueues;
    platform::NotificationCenter& notificationCenter;
};

// Where the online accounts of the cloud service are made.
struct OnlineAccountServer {
    std::string providerType; // the kind of server: "owncloud"
    std::string address;      // a URL
};

// The embedded account service, with these differences where the online accounts are served:
//  - Contacts, calendars and documents are the switches of the online account whose identity is the cloud
//    account's name, mail the switch of the mail account of that identity, which gives the mail address, too.
//    Of several such accounts the one that was made first counts, those of the cloud service's own provider
//    (for mail: of the mail provider) before others. A switch counts only where it has an effect. The
//    embedded service keeps everything that is asked for as well, and has the word where there is no such
//    switch.
//  - A completed sign-in makes the online account, once per identity, with its password and with nothing
//    switched on but what is enabled already; only then comes the notification. Where that fails, the account
//    stays an embedded one.
//  - A switch that could not be set, because nobody served the online accounts or they went meanwhile, is remembered,
//    and set to what the embedded service says with the next sign-in, or when the account is next asked for to be
//    set up.
//  - An account whose online account has been made and is gone, because the user has removed it, is no longer
//    logged in.
// Where nobody serves them there are no differences. Nothing of this shows an interface.
class OnlineAccountService final : public platform::AccountService, public platform::AccountManager {
  public:
    //  server  asked only where there are online accounts
    OnlineAccountService(OnlineAccountSurroundings surroundings, std::function<OnlineAccountServer()> server);
    ~OnlineAccountService() override;

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

  private:
    class Switches;
    class Account;
    class Service;
    class SignIn;

    std::shared_ptr<platform::CloudAccount> _wrap(std::shared_ptr<platform::CloudAccount> embedded) const;

    const OnlineAccountSurroundings _surroundings;
    const std::shared_ptr<const Switches>
        _switches; // shared with handles and with sign-ins that are under way
    const std::unique_ptr<platform::AccountService> _embedded;
    std::mutex _mutex;
    std::vector<std::shared_ptr<SignIn>> _signIns; // some of them over
};

} // namespace welcomer::desktop
