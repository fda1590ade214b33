#include "backends/local/accounts/AccountFile.h"

#include "platform/Path.h"
#include "propertylist/Lookup.h"

namespace welcomer::local {

namespace {

using State = DictionaryFileContent::State;

constexpr char kFolderName[] = "Accounts";
constexpr char kFileName[] = "Accounts.plist";

} // namespace

std::vector<std::string> AccountFile::names() {
    return ask([](const PropertyList::Dictionary& content) {
        std::vector<std::string> names;
        if (const PropertyList::Dictionary* accounts = dictionaryIn(content, kAccountsKey)) {
            for (const auto& [name, account] : *accounts) {
                if (account.isDictionary()) {
                    names.push_back(name);
                }
            }
        }
        return names;
    });
}

platform::Outcome AccountFile::change(const std::function<bool(PropertyList::Dictionary& content)>& change) {
    platform::Outcome outcome = _change(change);
    if (!outcome) {
        _log.write(platform::kErrorPriority, "The accounts could not be stored: " + outcome.error.message);
    }
    return outcome;
}

platform::Outcome AccountFile::_change(const std::function<bool(PropertyList::Dictionary& content)>& change) {
    const std::string library = _library();
    if (library.empty()) {
        return platform::Outcome::failure({0, "the user has no home folder"});
    }
    const std::string path = platform::joinPath(library, kFolderName);
    const std::lock_guard lock(_mutex);
    LockedDictionaryFolder folder(_root, path, posix::userLockPath(library, kFolderName));
    if (!folder) {
        return platform::Outcome::failure(folder.error());
    }
    const std::string filePath = platform::joinPath(path, kFileName);
    rereadDictionaryFile(_root, filePath, _onDisk);
    switch (_onDisk.state) {
    case State::Whole:
        break;
    case State::Damaged:
        if (!_setAside(folder, path)) {
            return platform::Outcome::failure(folder.error());
        }
        break;
    case State::Unreadable:
        return platform::Outcome::failure(
            {0, "cannot read " + _root.shown(filePath) + ": " + _onDisk.reason});
    }
    PropertyList::Dictionary values = _onDisk.values;
    if (!change(values)) {
        return platform::Outcome::success();
    }
    std::optional<std::string> bytes = folder.write(kFileName, values);
    if (!bytes) {
        return platform::Outcome::failure(folder.error());
    }
    _onDisk = {State::Whole, std::move(values), std::move(*bytes), {}};
    return platform::Outcome::success();
}

// Gives a damaged file another name.
//  path    the folder's
//  result  false when it is still in its place
bool AccountFile::_setAside(LockedDictionaryFolder& folder, const std::string& path) {
    const std::string other = folder.setAside(kFileName, _onDisk.bytes);
    _log.write(platform::kErrorPriority,
               "The accounts in " + _root.shown(path) + " are damaged (" + _onDisk.reason + ") and " +
                   (other.empty() ? "still in their place"
                                  : "now at " + _root.shown(platform::joinPath(path, other))));
    if (!other.empty()) {
        _onDisk = {};
    }
    return !other.empty();
}

const PropertyList::Dictionary& AccountFile::_readContent() {
    if (!_path) {
        const std::string library = _library();
        if (library.empty()) {
            return _onDisk.values;
        }
        _path = platform::joinPath(platform::joinPath(library, kFolderName), kFileName);
    }
    rereadDictionaryFile(_root, *_path, _onDisk);
    return _onDisk.values;
}

// Empty for a user without a home. Makes the library folder where it is missing: the platform gives the
// library folder without a "~".
std::string AccountFile::_library() {
    const std::vector<std::string> libraries = _identity.userLibraryDirectories();
    return libraries.empty() ? "" : libraries.front();
}

} // namespace welcomer::local
