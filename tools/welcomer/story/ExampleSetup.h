// The story's user, and the setup application that sets the user up.

#pragma once

#include "platform/AccountDirectory.h"
#include "tools/welcomer/story/AgentProcess.h"

#include <string>

namespace welcomer::tool {

inline constexpr const char* kExampleAccount = "user@nimbus.example";

// A new user with a password of its own, and with what the server answers.
platform::CloudUser exampleUser();

// The setup application's whole life, in a process of its own. Tells a document with the chosen "aliases" and
// the "delegates", or with the "failure" that ended it.
ChildLife setupLife(const std::string& password);

} // namespace welcomer::tool
