// What the account server's replies mean, for people where they mean nothing else.

#pragma once

#include "backends/accountserver/Messages.h"
#include "backends/desktop/accountserver/Transfer.h"
#include "platform/SignInDirectory.h"

#include <string>

namespace welcomer::desktop {

// The message of a reply with the status 200, or why it is none: one line.
accountserver::Decoded<accountserver::AuthenticateAnswer> readAnswer(const Reply& reply);
accountserver::Decoded<accountserver::ServerDescription> readDescription(const Reply& reply);

// What a reply with another status than it should have is for the account service.
//  server  its name for people
platform::SignInAnswer readFailure(const Reply& reply, const std::string& server);

// Says of a reply that it is no answer of an account server, and what it may be.
//  why  what is wrong with it
std::string describeStranger(const Reply& reply, const std::string& server, const std::string& why);

} // namespace welcomer::desktop
