// The accounts in the user's file, and the users in the machine's.

#pragma once

#include "backends/local/accounts/AccountFile.h"
#include "backends/local/accounts/NimbusDirectory.h"
#include "platform/AccountDirectory.h"

namespace welcomer::local {

// AccountFile.h and NimbusDirectory.h say where the files are and what is in them. The file of the users is
// made for its owner alone: whoever can read it can try passwords.
class LocalAccountDirectory final : public platform::AccountDirectory {
  public:
    // Borrows everything, which must outlive this.
    //  directory  says who can sign in in place of the machine's file, or null; it is not written
    LocalAccountDirectory(const posix::RootFolder& root, platform::ProcessIdentity& identity,
                          platform::SystemLog& log, const platform::SignInDirectory* directory = nullptr)
        : _machines(root),
          _replacement(directory),
          _accountFile(root, identity, log) {}

    std::vector<std::string> accounts() override;
    std::optional<std::vector<std::string>> users() override;
    platform::Outcome addUser(const platform::CloudUser& user) override;
    platform::Outcome storeUser(const platform::CloudUser& user) override;
    platform::Outcome removeUser(const std::string& name) override;
    platform::Outcome removeAccount(const std::string& name) override;
    platform::Outcome signOut() override;

  private:
    // A change of the account file that says whether what it is about is there; fails with ENOENT else.
    platform::Outcome _changeOrMiss(const std::string& missing,
                                    const std::function<bool(PropertyList::Dictionary&)>& change);

    const NimbusDirectory _machines;
    const platform::SignInDirectory* const _replacement;
    AccountFile _accountFile;
};

} // namespace welcomer::local
