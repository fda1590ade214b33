// Doing for a user what is the user's, on an administrator's behalf: `--user`.

#pragma once

#include "platform/SignInDirectory.h"
#include "tools/welcomer/cli/PlatformFactory.h"

#include <functional>
#include <string>

namespace welcomer::tool {

// Runs a command in a process that has become the user's for good (backends/posix/BecomeUser.h), so that
// nothing in the user's home is ever another's, or written through a link that leads to where the user may
// not write. This process stays root's, and does nothing but answer who can sign in, which root alone may
// read.
//  name     the user's login name
//  root     below which the home is looked up
//  command  what the user's process does; what it throws passes through here in that process
//  result   the command's result in the user's process, and in this one too: both have to end with it
// Throws CommandFailure, or UsageError for root as the user, before there is another process. A command that
// a signal has ended ends this process in the same way. Main thread, no other thread running.
int runAsUser(const std::string& name, const std::string& root, const PlatformFactory& buildPlatform,
              const std::function<int(platform::SignInDirectory&)>& command);

} // namespace welcomer::tool
