// Passwords: from the terminal without echo or from a descriptor, never from the command line.

#pragma once

#include "backends/posix/SecretText.h"

#include <optional>
#include <string>

namespace welcomer::tool {

// Where a command's password comes from: a descriptor, or the terminal.
using PasswordSource = std::optional<int>;

// Gets the password: the descriptor's first line, ended by LF or CR LF, or what is typed. Nothing beyond the
// line is read.
//  question  for the terminal
// Throws CommandFailure when there is none, and UsageError where there is neither descriptor nor terminal.
posix::SecretText getPassword(const PasswordSource& source, const std::string& question);

// The same for a new password: not empty, and typed twice.
posix::SecretText getNewPassword(const PasswordSource& source, const std::string& question);

} // namespace welcomer::tool
