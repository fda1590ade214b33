#include "backends/local/LocalProcessIdentity.h"

#include "backends/posix/Directory.h"
#include "platform/Error.h"
#include "platform/Path.h"

#include <cerrno>
#include <pwd.h>
#include <system_error>
#include <unistd.h>

namespace welcomer::local {

namespace {

constexpr std::size_t kFirstEntrySize = 1024;
constexpr mode_t kLibraryMode = 0700;

} // namespace

void LocalProcessIdentity::_readEntry() {
    const uid_t userID = ::geteuid();
    _loginName = std::to_string(userID);
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
        _whyNoHome = error != 0 ? ": " + std::generic_category().message(error) : "";
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
    if (_homeDirectory.empty()) {
        throw platform::Exception("the user " + _loginName + " has no home folder" + _whyNoHome);
    }
    return _homeDirectory;
}

std::vector<std::string> LocalProcessIdentity::userLibraryDirectories() {
    std::call_once(_entryRead, [this] { _readEntry(); });
    if (_homeDirectory.empty()) {
        return {};
    }
    const std::string library = platform::joinPath(_homeDirectory, "Library");
    // Fails where the folder exists already or the home folder does not; the path is right all the same.
    posix::makeDirectory(_root, library, kLibraryMode);
    return {library};
}

} // namespace welcomer::local
