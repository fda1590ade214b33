// The file that holds the user's accounts.

#pragma once

#include "backends/local/DictionaryFile.h"
#include "backends/posix/RootFolder.h"
#include "platform/Error.h"
#include "platform/ProcessIdentity.h"
#include "platform/SystemLog.h"
#include "propertylist/PropertyList.h"

#include <functional>
#include <mutex>
#include <optional>
#include <string>
#include <utility>
#include <vector>

namespace welcomer::local {

inline constexpr char kAccountsKey[] = "Accounts";
inline constexpr char kLoggedInAccountKey[] = "LoggedInAccount";

// "Accounts.plist" (0600) in "<home>/Library/Accounts" (0700), an XML property list:
//     Accounts         a dictionary from account name to account; each account has
//         Services         a dictionary from service identifier to service; each service has
//             CanBeEnabled     boolean, true where it is missing
//             Enabled          boolean, false where it is missing
//             Properties       dictionary, for example the mail address
//     LoggedInAccount  the name of the account that is logged in
//     SetupFinished    boolean: setup has said so
// A change takes the file's lock, merges into what is on disk and replaces the file in one step, so that no
// change of another process is lost and the file is whole at any time. A question reads the file, and parses
// it only where its bytes are no longer those of the last time. A damaged file counts as empty and is set
// aside before the first change; one that holds what XML cannot hold is left as it is, and no change is
// stored. Both are told in the system log. Any thread and any process.
class AccountFile {
  public:
    // Borrows the identity and the log, which must outlive this.
    AccountFile(posix::RootFolder root, platform::ProcessIdentity& identity, platform::SystemLog& log)
        : _root(std::move(root)),
          _identity(identity),
          _log(log) {}

    // Asks something of what is in the file now.
    //  question  is given everything, which is empty when there is nothing that can be read, and is valid
    //            only during the call; must not use this file itself
    //  result    the question's
    template <typename Question>
    auto ask(const Question& question) {
        const std::lock_guard lock(_mutex);
        return question(_readContent());
    }

    // The names of the accounts, in order.
    std::vector<std::string> names();

    // Changes the content.
    //  change  is given what is on disk; its result says whether that is to be stored
    //  result  a failure when it is to be and could not; its error names the path and the reason, and the
    //          system log has them, too
    platform::Outcome change(const std::function<bool(PropertyList::Dictionary& content)>& change);

  private:
    platform::Outcome _change(const std::function<bool(PropertyList::Dictionary& content)>& change);
    const PropertyList::Dictionary& _readContent();
    bool _setAside(LockedDictionaryFolder& folder, const std::string& path);
    std::string _library();

    const posix::RootFolder _root;
    platform::ProcessIdentity& _identity;
    platform::SystemLog& _log;
    std::mutex _mutex;                // guards what follows
    std::optional<std::string> _path; // of the file; none until it is first needed
    DictionaryFileContent _onDisk;    // as it was when it was last read or written
};

} // namespace welcomer::local
