// Doing for a user what is the user's, on an administrator's behalf: `--user`.

#pragma once

#include "backends/posix/PasswordEntry.h"
#include "platform/SignInDirectory.h"
#include "tools/welcomer/cli/PlatformFactory.h"

#include <functional>
#include <string>

namespace welcomer::tool {

// The user of this machine's whom root can act for: not root, with a home folder and a shell that lets
// somebody in. Throws CommandFailure where it is none, or where the caller is not root, and UsageError for root
// as the user.
posix::PasswordEntry userToActFor(const std::string& name);

// Runs a command in a process that has become the user's for good (backends/posix/BecomeUser.h), so that
// nothing in the user's home is ever another's, or written through a link that leads to where the user may
// not write. This process stays root's, and does nothing but answer who can sign in, which root alone may
// read.
//  root     below which the home is looked up
//  command  what the user's process does; what it throws passes through here in that process
//  result   the command's result in the user's process, and in this one too: both have to end with it
// Throws CommandFailure where there can be no such process. A command that a signal has ended ends this
// process in the same way. Main thread, no other thread running.
int runAsUser(const posix::PasswordEntry& user, const std::string& root, const PlatformFactory& buildPlatform,
              const std::function<int(platform::SignInDirectory&)>& command);

} // namespace welcomer::tool
