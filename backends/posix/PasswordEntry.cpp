#include "backends/posix/PasswordEntry.h"

#include <cerrno>
#include <pwd.h>

namespace welcomer::posix {

namespace {

constexpr std::size_t kFirstEntrySize = 1024;

// Asks with one of the C library's calls, and with more room for as long as that wants more.
template <class Call>
std::optional<PasswordEntry> entry(const Call& call, int& error) {
    std::string buffer(kFirstEntrySize, '\0');
    passwd found = {};
    passwd* result = nullptr;
    while ((error = call(&found, buffer.data(), buffer.size(), &result)) == ERANGE || error == EINTR) {
        if (error == ERANGE) {
            buffer.resize(2 * buffer.size());
        }
    }
    if (!result) {
        return std::nullopt;
    }
    return PasswordEntry{found.pw_name, found.pw_uid, found.pw_gid, found.pw_dir, found.pw_shell};
}

} // namespace

std::optional<PasswordEntry> passwordEntryOf(uid_t userID, int& error) {
    return entry([=](passwd* found, char* buffer, std::size_t size,
                     passwd** result) { return ::getpwuid_r(userID, found, buffer, size, result); },
                 error);
}

std::optional<PasswordEntry> passwordEntryNamed(const std::string& name, int& error) {
    return entry([&](passwd* found, char* buffer, std::size_t size,
                     passwd** result) { return ::getpwnam_r(name.c_str(), found, buffer, size, result); },
                 error);
}

} // namespace welcomer::posix
