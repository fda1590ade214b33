// The accounts in the user's file, and the users in the machine's.

#pragma once

#include "backends/local/accounts/AccountFile.h"
#include "platform/AccountDirectory.h"

namespace welcomer::local {

// AccountFile.h and NimbusDirectory.h say where the files are and what is in them. The file of the users is
// made for its owner alone: whoever can read it can try passwords.
class LocalAccountDirectory final : public platform::AccountDirectory {
  public:
    // Borrows the identity and the log, which must outlive this.
    LocalAccountDirectory(const posix::RootFolder& root, platform::ProcessIdentity& identity,
                          platform::SystemLog& log)
        : _root(root),
          _accountFile(root, identity, log) {}

    std::vector<std::string> accounts() override;
    std::optional<std::vector<std::string>> users() override;
    platform::Outcome addUser(const platform::CloudUser& user) override;
    platform::Outcome storeUser(const platform::CloudUser& user) override;

  private:
    const posix::RootFolder _root;
    AccountFile _accountFile;
};

} // namespace welcomer::local
