// The server's side of the embedded account service: who can sign in, and what they are answered. Setup and
// the agent ask none of this themselves.

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
    // purpose.
    virtual SignInAnswer answer(const std::string& username, const std::string& password) const = 0;

    // The services that an account gets when it is made: all of them for a user that the directory does not
    // know.
    virtual PropertyList::Dictionary servicesOfNewAccount(const std::string& username) const = 0;

    // The users' names in order, nobody's where there is no directory; none when it cannot be read.
    virtual std::optional<std::vector<std::string>> userNames() const = 0;
};

} // namespace welcomer::platform
