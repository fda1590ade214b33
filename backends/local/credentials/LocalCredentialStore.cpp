#include "backends/local/credentials/LocalCredentialStore.h"

#include "backends/local/credentials/CredentialFolder.h"
#include "backends/local/credentials/CredentialItemFormat.h"
#include "backends/posix/Directory.h"
#include "backends/posix/SystemError.h"
#include "platform/Error.h"
#include "platform/KeyedItemReference.h"
#include "platform/Path.h"

#include <algorithm>
#include <cerrno>
#include <fcntl.h>
#include <unistd.h>
#include <utility>

namespace welcomer::local {

namespace {

using Outcome = platform::CredentialOutcome;

constexpr char kFolderName[] = "Credentials";
constexpr mode_t kFolderMode = 0700;

PropertyList::Array::iterator findIn(PropertyList::Array& items, const std::string& service,
                                     const std::string& account) {
    return std::find_if(items.begin(), items.end(), [&](const PropertyList& item) {
        return credentialItemHasKey(item, service, account);
    });
}

bool hasHome(platform::ProcessIdentity& identity) {
    try {
        identity.homeDirectory();
        return true;
    } catch (const platform::Exception&) {
        return false;
    }
}

// Opens the folder for the creation of an item, and makes it where it is missing.
Outcome openOrMake(CredentialFolder& folder, const posix::RootFolder& root, const std::string& path) {
    Outcome outcome = folder.open(root, path);
    if (outcome == platform::kCredentialItemNotFound) {
        // Another process may make it at the same time.
        const int error = posix::makeDirectory(root, path, kFolderMode);
        outcome = error == 0 || error == EEXIST
                      ? folder.open(root, path)
                      : Outcome{platform::kCredentialWriteFailed,
                                posix::systemError(root.shown(path), error).message};
    }
    // What cannot be opened, as a file where the folder should be, cannot be written either.
    if (outcome == platform::kCredentialReadFailed) {
        outcome.status = platform::kCredentialWriteFailed;
    }
    return outcome;
}

// Whether items can be put into a folder, as far as can be told without doing so.
Outcome examineFolder(const posix::RootFolder& root, const std::string& path) {
    const posix::FileDescriptor folder = root.open(path, O_RDONLY | O_DIRECTORY);
    if (!folder || ::faccessat(folder.get(), ".", W_OK | X_OK, AT_EACCESS) != 0) {
        return {platform::kCredentialWriteFailed, posix::systemError(root.shown(path), errno).message};
    }
    return {};
}

} // namespace

std::string LocalCredentialStore::_library() {
    // Not userLibraryDirectories(), which would make a folder.
    return platform::joinPath(_identity.homeDirectory(), "Library");
}

std::string LocalCredentialStore::_folderPath() {
    return platform::joinPath(_library(), kFolderName);
}

Outcome LocalCredentialStore::_lock(CredentialFolder& folder) {
    return folder.lock(_root, posix::userLockPath(_library(), kFolderName));
}

Outcome LocalCredentialStore::createItem(const platform::CredentialItem& item, const std::string& data) {
    if (!hasHome(_identity)) {
        return {platform::kCredentialNoHome};
    }
    // Makes the library folder where it is missing.
    _identity.userLibraryDirectories();
    CredentialFolder folder;
    PropertyList::Array items;
    Outcome outcome = openOrMake(folder, _root, _folderPath());
    // Also where nothing can be locked, as in a home that is read-only.
    if (outcome == platform::kCredentialSuccess &&
        findItem(item.service, item.account, platform::CredentialWish::Presence)) {
        return {platform::kCredentialDuplicateItem};
    }
    if (outcome == platform::kCredentialSuccess) {
        outcome = _lock(folder);
    }
    if (outcome == platform::kCredentialSuccess) {
        outcome = folder.load(items);
    }
    if (outcome != platform::kCredentialSuccess) {
        return outcome;
    }
    if (findIn(items, item.service, item.account) != items.end()) {
        return {platform::kCredentialDuplicateItem};
    }
    items.push_back(makeCredentialItem(item, data));
    return folder.save(std::move(items));
}

platform::CredentialFinding LocalCredentialStore::findItem(const std::string& service,
                                                           const std::string& account,
                                                           platform::CredentialWish wish) {
    platform::CredentialFinding result;
    if (!hasHome(_identity)) {
        result.status = platform::kCredentialNoHome;
        return result;
    }
    if (credentialFileIsAbsent(_root, _folderPath())) {
        return result;
    }
    CredentialFolder folder;
    PropertyList::Array items;
    result.status = folder.open(_root, _folderPath()).status;
    std::string complaint;
    if (result) {
        result.status = folder.load(items, &complaint).status;
    }
    if (_log && !complaint.empty()) {
        _log->write(platform::kErrorPriority, complaint);
    }
    const auto found = findIn(items, service, account);
    if (result && found == items.end()) {
        result.status = platform::kCredentialItemNotFound;
    }
    if (!result) {
        return result;
    }
    result.item = credentialItemAttributes(*found);
    result.item.changed = folder.changed();
    result.reference = std::make_unique<platform::KeyedItemReference>(
        platform::CredentialStoreDescription{"local file", "every program of this user"}, service, account);
    if (wish == platform::CredentialWish::Secret) {
        result.secret = takeCredentialItemData(*found);
    }
    return result;
}

std::int32_t LocalCredentialStore::deleteItem(const platform::CredentialItemReference& reference) {
    const auto& key = dynamic_cast<const platform::KeyedItemReference&>(reference);
    CredentialFolder folder;
    PropertyList::Array items;
    Outcome outcome = folder.open(_root, _folderPath());
    if (outcome == platform::kCredentialSuccess) {
        outcome = _lock(folder);
    }
    if (outcome == platform::kCredentialSuccess) {
        outcome = folder.load(items);
    }
    if (outcome != platform::kCredentialSuccess) {
        return outcome.status;
    }
    const auto found = findIn(items, key.service(), key.account());
    if (found == items.end()) {
        return platform::kCredentialItemNotFound;
    }
    items.erase(found);
    return folder.save(std::move(items)).status;
}

Outcome LocalCredentialStore::examine() {
    if (!hasHome(_identity)) {
        return {platform::kCredentialNoHome};
    }
    CredentialFolder folder;
    PropertyList::Array items;
    Outcome outcome = folder.open(_root, _folderPath());
    if (outcome == platform::kCredentialItemNotFound) {
        // It is made in the library folder, and that in the home.
        return examineFolder(_root, _root.exists(_library()) ? _library() : _identity.homeDirectory());
    }
    if (outcome == platform::kCredentialSuccess) {
        outcome = folder.load(items);
    }
    return outcome == platform::kCredentialSuccess ? examineFolder(_root, _folderPath()) : outcome;
}

} // namespace welcomer::local
