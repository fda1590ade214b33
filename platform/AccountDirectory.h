// Which cloud accounts there are, and who can sign in to one: for the tool. Setup and the agent ask none of
// this.

#pragma once

#include "platform/Error.h"
#include "propertylist/PropertyList.h"

#include <optional>
#include <string>
#include <vector>

namespace welcomer::platform {

// Somebody who can sign in.
struct CloudUser {
    std::string name;
    std::string password;
    std::optional<std::string> mailAddress; // of the mail service in an account that is made for the user

    // What the server answers to the right password (platform/AccountService.h): a status, and the delegates'
    // responses with the aliases on offer.
    PropertyList::Dictionary response;
};

// Any thread.
class AccountDirectory {
  public:
    virtual ~AccountDirectory() = default;

    // The names of the current user's accounts, in order.
    virtual std::vector<std::string> accounts() = 0;

    // The names of those who can sign in, in order; none when that cannot be known here.
    virtual std::optional<std::vector<std::string>> users() = 0;

    // Has somebody be able to sign in. Fails with EEXIST when somebody of that name can already, whichever
    // process made it so.
    //  user  with a name that is not empty
    virtual Outcome addUser(const CloudUser& user) = 0;

    // The same, in place of whoever had that name. Accounts that exist do not change.
    virtual Outcome storeUser(const CloudUser& user) = 0;

    // Takes away what adding gave: nobody of that name can sign in any more. Accounts that exist do not
    // change. Fails with ENOENT when nobody of that name could.
    virtual Outcome removeUser(const std::string& name) = 0;

    // Removes one of the current user's accounts with all that is known of its services; the one that is
    // logged in is so no longer. Fails with ENOENT when there is none of that name.
    virtual Outcome removeAccount(const std::string& name) = 0;

    // Has none of the current user's accounts be logged in; all of them stay. Fails with ENOENT when none is.
    virtual Outcome signOut() = 0;
};

} // namespace welcomer::platform
