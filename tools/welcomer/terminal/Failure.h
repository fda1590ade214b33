// How what was asked for ends without being done: each with one line for the user.

#pragma once

#include <stdexcept>

namespace welcomer::tool {

// The command did not do what was asked: exit status 1.
class CommandFailure : public std::runtime_error {
  public:
    using std::runtime_error::runtime_error;
};

// The command line makes no sense, in a way that only the command itself can tell: exit status 2.
class UsageError : public std::runtime_error {
  public:
    using std::runtime_error::runtime_error;
};

} // namespace welcomer::tool
