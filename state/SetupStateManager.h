// What the keychain sync decision asks of the hosting setup application. The application implements these;
// each operation is called on the thread that asks for the decision, and does not throw.

#pragma once

#include "network/NetworkingManager.h"
#include "propertylist/PropertyList.h"

#include <optional>
#include <string>

namespace welcomer {

// The local account that is being set up.
class LocalUserAccountManager {
  public:
    virtual ~LocalUserAccountManager() = default;

    // Whether the user chose to secure the computer with a screen lock.
    virtual bool secureMyDesk() = 0;

    virtual std::optional<std::string> userName() = 0;
    virtual std::optional<std::string> password() = 0;
};

// The setup of the cloud account.
class CloudSetupManager {
  public:
    virtual ~CloudSetupManager() = default;

    // Whether a new cloud account is being created, and whether that is an identity which the maker provided.
    virtual bool creating() = 0;
    virtual bool hasCorvidProvidedID() = 0;

    // Whether cloud setup was abandoned.
    virtual bool abortSetup() = 0;

    // The account server's response for the main account, none when cloud sign-in did not happen.
    virtual std::optional<PropertyList::Dictionary> mainAccountResponseDict() = 0;

    virtual std::optional<std::string> username() = 0;
    virtual std::optional<std::string> password() = 0;

    // What the decision found out, for the rest of setup: whether a backup of the keychain is there; that it
    // is to be recovered without a circle; that keychain sync was skipped by a rule.
    virtual bool backupIsEnabled() = 0;
    virtual void setBackupIsEnabled(bool isEnabled) = 0;
    virtual void setIsBackupNoCircleRecovery(bool isRecovery) = 0;
    virtual void setAbortSyncSetup(bool abort) = 0;
};

// The helper that works on the user's keychain. Its operations block for as long as they take.
class WLLoginHelper {
  public:
    virtual ~WLLoginHelper() = default;

    // Creates the user's login keychain.
    virtual void createKeychain(const std::optional<std::string>& userName,
                                const std::optional<std::string>& password) = 0;

    //  bag  the account server's response
    virtual void configureNimbusAccountForKeychainSyncKVSPasswordBag(
        const std::optional<std::string>& userName, const std::optional<std::string>& password,
        const std::optional<PropertyList::Dictionary>& bag) = 0;

    //  result  whether the components of keychain sync are initialised
    virtual bool seedKeychainComponentsWithIDPassword(const std::optional<std::string>& userName,
                                                      const std::optional<std::string>& password) = 0;

    //  query   always none
    //  result  the circle's status under "status": 1 when a circle exists, 0 when none does; anything else is
    //          a failure
    virtual std::optional<PropertyList::Dictionary>
    queryKeychainSyncStatus(const std::optional<PropertyList>& query) = 0;

    virtual bool isBackupEnabled() = 0;

    // Whether the security code in escrow is a complex one.
    virtual bool escrowUsesComplexPasscode() = 0;
};

// The setup application's state. What it hands out is borrowed and lives as long as it does.
class SetupStateManager {
  public:
    virtual ~SetupStateManager() = default;

    // Whether the reduced setup is running, and whether setup runs only to offer keychain sync.
    virtual bool isMiniGreeter() = 0;
    virtual bool isKeychainUpsellGreeter() = 0;

    virtual LocalUserAccountManager& localUserAccountManager() = 0;
    virtual NetworkingManager& networkingManager() = 0;
    virtual CloudSetupManager& NimbusManager() = 0;
    virtual WLLoginHelper& wlloginhelper() = 0;
};

} // namespace welcomer
