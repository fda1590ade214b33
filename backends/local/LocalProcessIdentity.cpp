#include "backends/local/LocalProcessIdentity.h"

#include "backends/posix/Directory.h"
#include "backends/posix/PasswordEntry.h"
#include "platform/Error.h"
#include "platform/Path.h"

#include <optional>
#include <system_error>
#include <unistd.h>

namespace welcomer::local {

namespace {

constexpr mode_t kLibraryMode = 0700;

} // namespace

void LocalProcessIdentity::_readEntry() {
    const uid_t userID = ::geteuid();
    _loginName = std::to_string(userID);
    int error = 0;
    const std::optional<posix::PasswordEntry> found = posix::passwordEntryOf(userID, error);
    if (!found) {
        _whyNoHome = error != 0 ? ": " + std::generic_category().message(error) : "";
        return;
    }
    if (!found->name.empty()) {
        _loginName = found->name;
    }
    if (found->home.starts_with('/')) {
        _homeDirectory = found->home;
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
