// The system's error numbers as error objects.

#pragma once

#include "platform/Error.h"

#include <string>

namespace welcomer::posix {

// What could not be done, and why: "cannot remove /some/file: No such file or directory". Any thread.
platform::Error systemError(const std::string& what, int number);

// The outcome of something that ended with an error number, 0 being success. Any thread.
platform::Outcome systemOutcome(const std::string& what, int number);

} // namespace welcomer::posix
