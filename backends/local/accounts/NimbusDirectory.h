// The file of the users that can be authenticated on this machine: the server's side of the embedded account
// service.

#pragma once

#include "backends/local/DictionaryFileCache.h"
#include "backends/posix/RootFolder.h"
#include "platform/AccountDirectory.h"
#include "platform/SignInDirectory.h"
#include "propertylist/PropertyList.h"

#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace welcomer::local {

// Where the directory lies, below the platform's root.
inline constexpr char kNimbusDirectoryPath[] = "/var/lib/welcomer/nimbus-directory.plist";

// A property list in any format with one dictionary under "Users", from user name to user. Each user has
//     Password          the password's hash, as crypt(3) writes it (yescrypt where this system writes it);
//                       without one no password is right
//     Response          dictionary: what the server answers to the right password.
//                       "status" is an integer, 0 for success; "delegates" maps delegate identifiers to
//                       their responses, with the aliases on offer. Without one the answer is a status of
//                       0; what is there and is no dictionary cannot be read
//     AccountError      integer: has the operation fail with this account error
//     AccountErrorInfo  anything: goes with the account error
//     Fails             boolean: has the operation fail although there is no account error; so does what
//                       is there and reads as none
//     DelaySeconds      number: how long the answer takes
//     MailAddress       string: the mail service's address in an account that is made for the user
//     Services          dictionary from service identifier to service, as the account file has them: the
//                       services of an account that is made for the user, in place of all of them
class NimbusDirectory final : public platform::SignInDirectory {
  public:
    explicit NimbusDirectory(posix::RootFolder root) : _root(std::move(root)) {}

    // Each sees the file as it is at the time; one that is damaged counts as one that cannot be read. An answer takes as long
    // where there is no such user as where the password is wrong.
    platform::SignInAnswer answer(const std::string& username, const std::string& password,
                                  const PropertyList::Dictionary& delegateRequest) const override;
    std::string server() const override { return ""; }
    PropertyList::Dictionary servicesOfNewAccount(const std::string& username) const override;
    std::optional<std::vector<std::string>> userNames() const override;

    // Takes the account error for the terms of service, with its info, from the user. What is to be accepted
    // is the info; other terms than that are none.
    platform::SignInAnswer acceptTerms(const std::string& username, const std::string& password,
                                       const PropertyList& terms) const override;

    // Writes a user. A directory that is made for it is its owner's alone: whoever can read it can try
    // passwords. A damaged one is left as it is. Any thread and any process.
    //  ifThere  what is done where the directory has somebody of that name: all that it has about them is
    //           replaced, or the call fails with EEXIST
    enum class IfThere { Replace, Fail };
    platform::Outcome writeUser(const platform::CloudUser& user, IfThere ifThere) const;

    // Removes a user; fails with ENOENT where there is none of that name. Any thread and any process.
    platform::Outcome removeUser(const std::string& name) const;

  private:
    // Changes the dictionary of users, in one step and under the lock.
    //  change  is given the users and what the file is called; its failure leaves the file as it is
    using Change = std::function<platform::Outcome(PropertyList::Dictionary&, const std::string&)>;
    platform::Outcome _change(const Change& change) const;

    std::shared_ptr<const PropertyList::Dictionary> _users() const; // null when it cannot be read

    // What the directory has about a user, or why the password opens nothing.
    struct Found {
        std::optional<PropertyList> user;
        platform::SignInAnswer refusal;
    };
    Found _find(const std::string& username, const std::string& password) const;

    const posix::RootFolder _root;
    mutable DictionaryFileCache _file{_root, kNimbusDirectoryPath};
};

} // namespace welcomer::local
