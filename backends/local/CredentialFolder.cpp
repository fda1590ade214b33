#include "backends/local/CredentialFolder.h"

#include "backends/local/AtomicFile.h"
#include "backends/local/CredentialItemFormat.h"
#include "backends/local/FileContent.h"
#include "platform/CredentialStore.h"
#include "platform/Path.h"
#include "propertylist/PropertyListReader.h"
#include "propertylist/PropertyListWriter.h"

#include <algorithm>
#include <cerrno>
#include <fcntl.h>
#include <optional>
#include <sys/stat.h>
#include <unistd.h>
#include <utility>

namespace welcomer::local {

namespace {

constexpr char kFileName[] = "Items.plist";
constexpr char kItemsKey[] = "Items";
constexpr char kVersionKey[] = "Version";
constexpr int kVersion = 1;
constexpr mode_t kFileMode = 0600;
constexpr mode_t kWritableByOthers = 022;

bool isOwn(const struct stat& status) {
    return status.st_uid == ::geteuid() && (status.st_mode & kWritableByOthers) == 0;
}

bool isSymbolicLink(const std::string& path) {
    struct stat status = {};
    return ::lstat(path.c_str(), &status) == 0 && S_ISLNK(status.st_mode);
}

bool takeItems(std::string_view bytes, PropertyList::Array& items) {
    PropertyListReadResult result = readPropertyList(bytes);
    PropertyList::Dictionary* store = result ? result.value->dictionary() : nullptr;
    if (!store || !store->contains(kVersionKey) || !store->contains(kItemsKey) ||
        store->at(kVersionKey) != PropertyList(kVersion)) {
        return false;
    }
    PropertyList::Array* stored = store->at(kItemsKey).array();
    if (!stored || !std::all_of(stored->begin(), stored->end(), isCredentialItem)) {
        return false;
    }
    items = std::move(*stored);
    return true;
}

} // namespace

bool credentialFileIsAbsent(const std::string& folderPath) {
    return ::access(platform::joinPath(folderPath, kFileName).c_str(), F_OK) != 0 && errno == ENOENT;
}

std::int32_t CredentialFolder::open(const std::string& path) {
    _folder = FileDescriptor(::open(path.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
    if (!_folder && errno == ENOENT) {
        return platform::kCredentialItemNotFound;
    }
    if (!_folder) {
        return isSymbolicLink(path) ? platform::kCredentialStoreUnsafe : platform::kCredentialReadFailed;
    }
    struct stat status = {};
    if (::fstat(_folder.get(), &status) != 0) {
        return platform::kCredentialReadFailed;
    }
    return isOwn(status) ? platform::kCredentialSuccess : platform::kCredentialStoreUnsafe;
}

std::int32_t CredentialFolder::lock() {
    if (lockFolder(_folder.get()) != 0) {
        return platform::kCredentialWriteFailed;
    }
    removeLeftOver(_folder.get(), kFileName);
    return platform::kCredentialSuccess;
}

std::int32_t CredentialFolder::load(PropertyList::Array& items) const {
    items.clear();
    // A pipe must not block.
    const FileDescriptor file(
        ::openat(_folder.get(), kFileName, O_RDONLY | O_NOFOLLOW | O_CLOEXEC | O_NONBLOCK));
    if (!file && errno == ENOENT) {
        return platform::kCredentialSuccess;
    }
    if (!file) {
        return errno == ELOOP ? platform::kCredentialStoreUnsafe : platform::kCredentialReadFailed;
    }
    struct stat status = {};
    if (::fstat(file.get(), &status) != 0) {
        return platform::kCredentialReadFailed;
    }
    if (!S_ISREG(status.st_mode) || !isOwn(status)) {
        return platform::kCredentialStoreUnsafe;
    }
    std::string bytes;
    if (readAll(file.get(), bytes) != 0) {
        return platform::kCredentialReadFailed;
    }
    return takeItems(bytes, items) ? platform::kCredentialSuccess : platform::kCredentialStoreDamaged;
}

std::int32_t CredentialFolder::save(PropertyList::Array items) const {
    if (items.empty()) {
        const bool removed = ::unlinkat(_folder.get(), kFileName, 0) == 0;
        if (removed) {
            // A deleted item must not come back after a crash.
            ::fsync(_folder.get());
            return platform::kCredentialSuccess;
        }
        if (errno != EBUSY) {
            return platform::kCredentialWriteFailed;
        }
        // A mount point cannot be removed: it keeps an empty list.
    }
    PropertyList::Dictionary store;
    store[kVersionKey] = kVersion;
    store[kItemsKey] = std::move(items);
    const std::optional<std::string> bytes = writeXMLPropertyList(PropertyList(std::move(store)));
    return bytes && replaceFile(_folder.get(), kFileName, *bytes, kFileMode) == 0
               ? platform::kCredentialSuccess
               : platform::kCredentialWriteFailed;
}

} // namespace welcomer::local
