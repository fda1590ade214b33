// The story's user, and the setup application that sets the user up.

#pragma once

#include "platform/AccountDirectory.h"
#include "tools/welcomer/story/AgentProcess.h"

#include <string>

namespace welcomer::tool {

inline constexpr const char* kExampleAccount = "user@nimbus.example";

// A new user with a password of its own, and with what the server answers.
//  responses  of further delegates, or in the place of the examples', by identifier
platform::CloudUser exampleUser(const PropertyList::Dictionary& responses = {});

// The setup application's whole life, in a process of its own. Tells a document with the chosen "aliases" and
// the "delegates", or with the "failure" that ended it.
ChildLife setupLife(const std::string& password);

} // namespace welcomer::tool
