#include "backends/local/credentials/LocalCredentialStore.h"

#include "backends/local/credentials/CredentialFolder.h"
#include "backends/local/credentials/CredentialItemFormat.h"
#include "backends/posix/Directory.h"
#include "platform/Error.h"
#include "platform/Path.h"

#include <algorithm>
#include <cerrno>
#include <utility>

namespace welcomer::local {

namespace {

constexpr char kFolderName[] = "Credentials";
constexpr mode_t kFolderMode = 0700;

class Reference final : public platform::CredentialItemReference {
  public:
    Reference(std::string service, std::string account)
        : _service(std::move(service)),
          _account(std::move(account)) {}

    platform::CredentialStoreDescription store() const override {
        return {"local file", "every program of this user"};
    }
    const std::string& service() const { return _service; }
    const std::string& account() const { return _account; }

  private:
    std::string _service;
    std::string _account;
};

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
std::int32_t openOrMake(CredentialFolder& folder, const posix::RootFolder& root, const std::string& path) {
    std::int32_t status = folder.open(root, path);
    if (status == platform::kCredentialItemNotFound) {
        // Another process may make it at the same time.
        const int error = posix::makeDirectory(root, path, kFolderMode);
        status = error == 0 || error == EEXIST ? folder.open(root, path) : platform::kCredentialWriteFailed;
    }
    // What cannot be opened, as a file where the folder should be, cannot be written either.
    return status == platform::kCredentialReadFailed ? platform::kCredentialWriteFailed : status;
}

// Copies the one item out of the store at a path.
//  changed  when its file was last changed
std::int32_t readItem(const posix::RootFolder& root, const std::string& folderPath,
                      const std::string& service, const std::string& account, PropertyList& item,
                      std::int64_t& changed) {
    if (credentialFileIsAbsent(root, folderPath)) {
        return platform::kCredentialItemNotFound;
    }
    CredentialFolder folder;
    PropertyList::Array items;
    std::int32_t status = folder.open(root, folderPath);
    if (status == platform::kCredentialSuccess) {
        status = folder.load(items);
    }
    if (status != platform::kCredentialSuccess) {
        return status;
    }
    const auto found = findIn(items, service, account);
    if (found == items.end()) {
        return platform::kCredentialItemNotFound;
    }
    item = std::move(*found);
    changed = folder.changed();
    return platform::kCredentialSuccess;
}

} // namespace

std::string LocalCredentialStore::_library() {
    // Not userLibraryDirectories(), which would make a folder.
    return platform::joinPath(_identity.homeDirectory(), "Library");
}

std::string LocalCredentialStore::_folderPath() {
    return platform::joinPath(_library(), kFolderName);
}

std::int32_t LocalCredentialStore::_lock(CredentialFolder& folder) {
    return folder.lock(_root, posix::userLockPath(_library(), kFolderName));
}

std::int32_t LocalCredentialStore::createTrustedApplication(const std::string& path,
                                                            platform::TrustedApplication& application) {
    if (!path.starts_with('/')) {
        return platform::kCredentialInvalidPath;
    }
    application.path = path;
    return platform::kCredentialSuccess;
}

std::int32_t LocalCredentialStore::createAccess(const std::string& description,
                                                std::vector<platform::TrustedApplication> trustedApplications,
                                                platform::CredentialAccess& access) {
    access = {description, std::move(trustedApplications)};
    return platform::kCredentialSuccess;
}

std::int32_t LocalCredentialStore::createItem(const platform::CredentialItem& item, const std::string& data) {
    if (!hasHome(_identity)) {
        return platform::kCredentialNoHome;
    }
    // Makes the library folder where it is missing.
    _identity.userLibraryDirectories();
    CredentialFolder folder;
    PropertyList::Array items;
    std::int32_t status = openOrMake(folder, _root, _folderPath());
    // Also where nothing can be locked, as in a home that is read-only.
    if (status == platform::kCredentialSuccess &&
        findItem(item.service, item.account, nullptr, nullptr) == platform::kCredentialSuccess) {
        return platform::kCredentialDuplicateItem;
    }
    if (status == platform::kCredentialSuccess) {
        status = _lock(folder);
    }
    if (status == platform::kCredentialSuccess) {
        status = folder.load(items);
    }
    if (status != platform::kCredentialSuccess) {
        return status;
    }
    if (findIn(items, item.service, item.account) != items.end()) {
        return platform::kCredentialDuplicateItem;
    }
    items.push_back(makeCredentialItem(item, data));
    return folder.save(std::move(items));
}

std::int32_t LocalCredentialStore::findItem(const std::string& service, const std::string& account,
                                            std::string* data,
                                            std::unique_ptr<platform::CredentialItemReference>* reference) {
    if (!hasHome(_identity)) {
        return platform::kCredentialNoHome;
    }
    PropertyList item;
    std::int64_t changed = 0;
    const std::int32_t status = readItem(_root, _folderPath(), service, account, item, changed);
    if (status != platform::kCredentialSuccess) {
        return status;
    }
    if (data) {
        *data = takeCredentialItemData(item);
    }
    if (reference) {
        *reference = std::make_unique<Reference>(service, account);
    }
    return platform::kCredentialSuccess;
}

std::int32_t LocalCredentialStore::readAttributes(const platform::CredentialItemReference& reference,
                                                  platform::CredentialItem& item) {
    const auto& key = dynamic_cast<const Reference&>(reference);
    PropertyList stored;
    std::int64_t changed = 0;
    const std::int32_t status = readItem(_root, _folderPath(), key.service(), key.account(), stored, changed);
    if (status == platform::kCredentialSuccess) {
        item = credentialItemAttributes(stored);
        item.changed = changed;
    }
    return status;
}

std::int32_t LocalCredentialStore::deleteItem(const platform::CredentialItemReference& reference) {
    const auto& key = dynamic_cast<const Reference&>(reference);
    CredentialFolder folder;
    PropertyList::Array items;
    std::int32_t status = folder.open(_root, _folderPath());
    if (status == platform::kCredentialSuccess) {
        status = _lock(folder);
    }
    if (status == platform::kCredentialSuccess) {
        status = folder.load(items);
    }
    if (status != platform::kCredentialSuccess) {
        return status;
    }
    const auto found = findIn(items, key.service(), key.account());
    if (found == items.end()) {
        return platform::kCredentialItemNotFound;
    }
    items.erase(found);
    return folder.save(std::move(items));
}

} // namespace welcomer::local
