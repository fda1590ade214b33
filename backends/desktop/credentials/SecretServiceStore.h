// Credentials as items of the Secret Service, the desktop's keyring.

#pragma once

#include "backends/desktop/credentials/CredentialModule.h"
#include "backends/desktop/credentials/SecretServiceQuestion.h"

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
// Each operation, with everything that it asks, is over after ten seconds; what a person takes to answer is
// not counted. Of several items with one service and account, which another program may have made, the newest
// is read (an unlocked one before those that are locked), and all are deleted.
//
// Nothing of the service is kept from one operation to the next, nor in a reference but the item's key: the
// service may end and be started anew in between.
//
// Statuses, besides those of every store: kCredentialLocked, kCredentialDismissed,
// kCredentialPromptUnanswered, kCredentialNoService (nobody has its name, and the bus knows of nothing to
// start for it), kCredentialStartFailed, kCredentialBusDied, kCredentialTooLarge (more than kLargestSecret
// bytes), kCredentialServiceFailed, and each operation's time-out. Any thread; operations are done one after
// the other.
class SecretServiceStore final : public platform::CredentialStore {
  public:
    explicit SecretServiceStore(CredentialModule::Arguments arguments) : _arguments(arguments) {}

    // Refuses an item that is there already, locked or not. That and the creation are two steps: the caller
    // sees to it that nobody comes in between.
    platform::CredentialOutcome createItem(const platform::CredentialItem& item,
                                           const std::string& data) override;
    platform::CredentialFinding findItem(const std::string& service, const std::string& account,
                                         platform::CredentialWish wish) override;
    std::int32_t deleteItem(const platform::CredentialItemReference& reference) override;

  private:
    // For one operation, with _mutex held.
    SecretServiceQuestion _question();

    const CredentialModule::Arguments _arguments;
    std::mutex _mutex;
    // So that whatever shares the connection in this process survives the bus, too.
    Bus _bus{G_BUS_TYPE_SESSION, Bus::Sharing::WithLibraries};
};

} // namespace welcomer::desktop
