// Passwords: from the terminal without echo or from a descriptor, never from the command line.

#pragma once

#include "backends/posix/SecretText.h"

#include <optional>
#include <string>

namespace welcomer::tool {

// Where a command's password comes from: a descriptor, or the terminal.
using PasswordSource = std::optional<int>;

// Wipes a password at the end of its scope.
class WipedAtEnd {
  public:
    //  password  borrowed
    explicit WipedAtEnd(std::string& password) : _password(password) {}
    ~WipedAtEnd() { posix::wipe(_password); }
    WipedAtEnd(const WipedAtEnd&) = delete;
    WipedAtEnd& operator=(const WipedAtEnd&) = delete;

  private:
    std::string& _password;
};

// Gets the password: the descriptor's first line, ended by LF or CR LF, or what is typed. Nothing beyond the
// line is read.
//  question  for the terminal
// Throws CommandFailure when there is none, and UsageError where there is neither descriptor nor terminal.
std::string getPassword(const PasswordSource& source, const std::string& question);

// The same for a new password: not empty, and typed twice.
std::string getNewPassword(const PasswordSource& source, const std::string& question);

} // namespace welcomer::tool
