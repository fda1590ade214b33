// Where users and their passwords are looked up.

#pragma once

#include "backends/accountserver/Messages.h"

#include <chrono>
#include <optional>
#include <string>
#include <variant>

namespace welcomer::server {

struct SourceAnswer {
    // With WrongPassword and UnknownUser told apart.
    std::variant<accountserver::AuthenticateAnswer, accountserver::Problem> content;
    std::string identity;                   // whom the source has met under this name; empty for nobody
    std::chrono::duration<double> delay{0}; // how long the answer is to be held back
};

// On threads that may block, several at once.
class AccountSource {
  public:
    virtual ~AccountSource() = default;

    // Checks a password. Throws nothing: what cannot be asked is a problem, too.
    virtual SourceAnswer authenticate(const std::string& user, const std::string& password) = 0;

    // Notes that a user has accepted terms of service: who authenticates afterwards is not asked for these any
    // more. The password is checked in the same way.
    //  terms   the error info that asked for them
    //  result  an answer without content that matters, or the problem
    virtual SourceAnswer acceptTerms(const std::string& user, const std::string& password,
                                     const PropertyList& terms) = 0;
};

} // namespace welcomer::server
