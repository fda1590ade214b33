#include "backends/posix/SystemError.h"

#include <system_error>

namespace welcomer::posix {

platform::Error systemError(const std::string& what, int number) {
    return {number, what + ": " + std::generic_category().message(number)};
}

platform::Outcome systemOutcome(const std::string& what, int number) {
    return number == 0 ? platform::Outcome::success() : platform::Outcome::failure(systemError(what, number));
}

} // namespace welcomer::posix
