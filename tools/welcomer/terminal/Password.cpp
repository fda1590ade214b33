#include "tools/welcomer/terminal/Password.h"

#include "tools/welcomer/terminal/Failure.h"
#include "tools/welcomer/terminal/Terminal.h"

#include <cerrno>
#include <system_error>
#include <unistd.h>

namespace welcomer::tool {

namespace {

constexpr std::size_t kLongestPassword = 4096;
constexpr const char* kInsteadOfTerminal = "--password-fd N";

// One byte at a time: what follows the line is somebody else's. A carriage return before the line's end
// belongs to that.
void readLine(int descriptor, std::string& line) {
    const std::string option = "--password-fd " + std::to_string(descriptor) + ": ";
    for (;;) {
        char byte = 0;
        const ssize_t count = ::read(descriptor, &byte, 1);
        if (count < 0 && errno == EINTR) {
            continue;
        }
        if (count < 0) {
            throw CommandFailure(option + std::generic_category().message(errno));
        }
        if (count == 0 || byte == '\n') {
            if (line.ends_with('\r')) {
                line.pop_back();
            }
            if (line.size() <= kLongestPassword) {
                return;
            }
        }
        if (line.size() > kLongestPassword) {
            throw CommandFailure(option + "the password is too long");
        }
        line += byte;
    }
}

} // namespace

posix::SecretText getPassword(const PasswordSource& source, const std::string& question) {
    if (!source) {
        return Terminal(kInsteadOfTerminal).askWithoutEcho(question);
    }
    return {kLongestPassword + 1, [&](std::string& line) {
                readLine(*source, line);
            }};
}

posix::SecretText getNewPassword(const PasswordSource& source, const std::string& question) {
    posix::SecretText password = getPassword(source, question);
    if (password.text().empty()) {
        throw CommandFailure("the password is empty");
    }
    if (!source && Terminal(kInsteadOfTerminal).askWithoutEcho("Once more:").text() != password.text()) {
        throw CommandFailure("the two passwords differ");
    }
    return password;
}

} // namespace welcomer::tool
