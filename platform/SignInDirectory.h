// The server's side of the embedded account service: who can sign in, and what they are answered, by a file
// of the machine or by a server elsewhere. Setup and the agent ask none of this themselves.

#pragma once

#include "propertylist/PropertyList.h"

#include <optional>
#include <string>
#include <vector>

namespace welcomer::platform {

struct SignInAnswer {
    bool isCompleted = false;
    PropertyList::Dictionary contents; // what the notification says
    double delaySeconds = 0;           // how long the answer takes
};

// Any thread.
class SignInDirectory {
  public:
    virtual ~SignInDirectory() = default;

    // What the server answers to a user name and a password. Checking a password takes some milliseconds on
    // purpose; asking a server elsewhere blocks for half a minute where it is silent.
    //  delegateRequest  as platform::AccountManager is given it
    virtual SignInAnswer answer(const std::string& username, const std::string& password,
                                const PropertyList::Dictionary& delegateRequest) const = 0;

    // Says that the user has accepted the terms of service. Blocks as above.
    //  terms   the account error info that asked for it, as it came
    //  result  completed where they are accepted, now or before; else `contents` has the account error
    virtual SignInAnswer acceptTerms(const std::string& username, const std::string& password,
                                     const PropertyList& terms) const = 0;

    // Which server is asked, as the settings have it: "https://accounts.example"; empty for a file of the
    // machine.
    virtual std::string server() const = 0;

    // The services that an account gets when it is made: all of them for a user that the directory does not
    // know. A server elsewhere knows those that it has answered with the right password, in this process.
    virtual PropertyList::Dictionary servicesOfNewAccount(const std::string& username) const = 0;

    // The users' names in order, nobody's where there is no directory; none when it cannot be read, as nobody
    // can who asks a server.
    virtual std::optional<std::vector<std::string>> userNames() const = 0;
};

} // namespace welcomer::platform
