// Generic-password items in one file of the user's own.

#pragma once

#include "backends/local/credentials/CredentialFolder.h"
#include "backends/posix/RootFolder.h"
#include "platform/CredentialStore.h"
#include "platform/ProcessIdentity.h"
#include "platform/SystemLog.h"

namespace welcomer::local {

// The file is "Items.plist" (0600) in "<home>/Library/Credentials" (0700), an XML property list. What keeps a
// secret from others is the file's mode alone: an item's access description and its trusted applications are
// kept and shown, but NOT enforced. Every program of the user can read every item.
//
// The folder and the file are used only when they are the user's own, no symbolic links, and writable by
// nobody else. A file that others may read is made the user's alone when an item is looked up, with one line in the
// log. Writers take the folder's lock (FileLock.h) and replace the file in one step; readers take no
// lock. A file that cannot be read as what it should be is never written again, until somebody removes it.
// Deleting the last item removes the file. All items have one time, the file's. Looking up an item in a store
// that does not exist makes one system call where the root is "/".
class LocalCredentialStore final : public platform::CredentialStore {
  public:
    // Borrows the identity and the log, which must outlive the store.
    //  log  where a file that others could read is complained about; null: nowhere
    LocalCredentialStore(posix::RootFolder root, platform::ProcessIdentity& identity,
                         platform::SystemLog* log = nullptr)
        : _root(std::move(root)),
          _identity(identity),
          _log(log) {}

    platform::CredentialOutcome createItem(const platform::CredentialItem& item,
                                           const std::string& data) override;
    platform::CredentialFinding findItem(const std::string& service, const std::string& account,
                                         platform::CredentialWish wish) override;
    std::int32_t deleteItem(const platform::CredentialItemReference& reference) override;
    platform::CredentialOutcome examine() override;

  private:
    // The library folder, which is not made.
    std::string _library();
    // The folder of the credentials.
    std::string _folderPath();
    // Keeps other writers out.
    platform::CredentialOutcome _lock(CredentialFolder& folder);

    const posix::RootFolder _root;
    platform::ProcessIdentity& _identity;
    platform::SystemLog* const _log;
};

} // namespace welcomer::local
