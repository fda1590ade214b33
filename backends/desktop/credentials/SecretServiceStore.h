// Credentials as items of the Secret Service, the desktop's keyring.

#pragma once

#include "backends/desktop/CredentialModule.h"
#include "backends/desktop/credentials/LibSecret.h"
#include "backends/desktop/credentials/SessionBus.h"
#include "platform/BackendReport.h"

#include <mutex>
#include <string>
#include <vector>

namespace welcomer::desktop {

// An item's service and account are the attributes "service" and "account", its name is the label, its data
// the secret, bytes unchanged, encrypted on their way. New items go to the default collection, which is made
// where there is none. The access is kept in further attributes; the service does not enforce it: every
// program of the session can read an unlocked keyring.
//
// A plain look-up of the service reports a locked item like a missing one: here items are searched for, and
// then unlocked, which may ask the user. A prompt that nobody answers is given up after a while.
//
// Nothing of the service is kept from one operation to the next, nor in a reference but the item's path: the
// service may end and be started anew in between.
//
// Statuses, besides those of every store: kCredentialLocked, kCredentialDismissed,
// kCredentialPromptUnanswered, kCredentialNoService, kCredentialNoBus, kCredentialTooLarge (more than
// kLargestSecret bytes), kCredentialServiceFailed. Any thread; operations are done one after the other.
class SecretServiceStore final : public platform::CredentialStore {
  public:
    explicit SecretServiceStore(CredentialModule::Arguments arguments) : _arguments(arguments) {}

    std::int32_t createTrustedApplication(const std::string& path,
                                          platform::TrustedApplication& application) override;
    std::int32_t createAccess(const std::string& description,
                              std::vector<platform::TrustedApplication> trustedApplications,
                              platform::CredentialAccess& access) override;
    // Refuses an item that is there already, locked or not. That and the creation are two steps: the caller
    // sees to it that nobody comes in between.
    std::int32_t createItem(const platform::CredentialItem& item, const std::string& data) override;
    std::int32_t findItem(const std::string& service, const std::string& account, std::string* data,
                          std::unique_ptr<platform::CredentialItemReference>* reference) override;
    std::int32_t readAttributes(const platform::CredentialItemReference& reference,
                                platform::CredentialItem& item) override;
    std::int32_t deleteItem(const platform::CredentialItemReference& reference) override;

    // In what state the keyring is: asks the service, never the user. Any thread.
    //  result  whether the service serves
    bool describe(platform::BackendReport& report);

  private:
    struct SearchResult {
        std::string path; // of the first item that is not locked, else of the first one
        bool isLocked = false;
    };

    // All with _mutex held, and with the status of what failed.
    static std::int32_t _search(GDBusConnection* connection, const std::string& service,
                                const std::string& account, SearchResult& result);
    std::int32_t _defaultCollection(GDBusConnection* connection, SecretService* library, std::string& path);
    std::int32_t _unlock(SecretService* library, const std::string& path);
    std::int32_t _refusal(const class PromptWait& wait, const GError* error);

    const CredentialModule::Arguments _arguments;
    std::mutex _mutex;
    SessionBus _bus;
};

} // namespace welcomer::desktop
