// What the account server's answers are for the account service: docs/account-server.md has the table.

#pragma once

#include "backends/accountserver/Messages.h"
#include "platform/SignInDirectory.h"

#include <cstdint>
#include <optional>
#include <string>

namespace welcomer::accountserver {

// What the notification says of an answer, which is a completed one. Any thread.
platform::SignInAnswer signInAnswerOf(const AuthenticateAnswer& answer);

// The same for a failure.
//  retryAfter  what the header field Retry-After says, in seconds, or none
platform::SignInAnswer signInAnswerOf(const Problem& problem,
                                      std::optional<std::int64_t> retryAfter = std::nullopt);

// The same where the server gave no answer that means anything.
//  why  one line for people
platform::SignInAnswer unavailable(const std::string& why);

// The services that an account gets when it is made after this answer, as platform::SignInDirectory has them.
// Any thread.
PropertyList::Dictionary servicesOf(const AuthenticateAnswer& answer);

} // namespace welcomer::accountserver
