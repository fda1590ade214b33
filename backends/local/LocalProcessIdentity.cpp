#include "backends/local/LocalProcessIdentity.h"

#include "backends/local/Directory.h"
#include "platform/Path.h"

#include <cerrno>
#include <pwd.h>
#include <unistd.h>

namespace welcomer::local {

namespace {

constexpr std::size_t kFirstEntrySize = 1024;
constexpr mode_t kLibraryMode = 0700;

} // namespace

void LocalProcessIdentity::_readEntry() {
    const uid_t userID = ::geteuid();
    _loginName = std::to_string(userID);
    _homeDirectory = "/";

    std::string buffer(kFirstEntrySize, '\0');
    passwd entry = {};
    passwd* found = nullptr;
    int error = 0;
    while ((error = ::getpwuid_r(userID, &entry, buffer.data(), buffer.size(), &found)) == ERANGE ||
           error == EINTR) {
        if (error == ERANGE) {
            buffer.resize(2 * buffer.size());
        }
    }
    if (!found) {
        return;
    }
    if (*found->pw_name != '\0') {
        _loginName = found->pw_name;
    }
    if (*found->pw_dir == '/') {
        _homeDirectory = found->pw_dir;
    }
}

std::uint32_t LocalProcessIdentity::effectiveUserID() {
    return ::geteuid();
}

std::string LocalProcessIdentity::loginName() {
    std::call_once(_entryRead, [this] { _readEntry(); });
    return _loginName;
}

std::string LocalProcessIdentity::homeDirectory() {
    std::call_once(_entryRead, [this] { _readEntry(); });
    return _homeDirectory;
}

std::vector<std::string> LocalProcessIdentity::userLibraryDirectories() {
    const std::string library = platform::joinPath(homeDirectory(), "Library");
    // Fails where the folder exists already or the home folder does not; the path is right all the same.
    makeDirectory(_root, library, kLibraryMode);
    return {library};
}

} // namespace welcomer::local
