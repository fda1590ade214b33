#include "backends/local/credentials/CredentialFolder.h"

#include "backends/local/credentials/CredentialItemFormat.h"
#include "backends/posix/AtomicFile.h"
#include "backends/posix/FileContent.h"
#include "backends/posix/SystemError.h"
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

using Outcome = platform::CredentialOutcome;

constexpr char kFileName[] = "Items.plist";
constexpr char kItemsKey[] = "Items";
constexpr char kVersionKey[] = "Version";
constexpr int kVersion = 1;
constexpr mode_t kFileMode = 0600;
constexpr mode_t kWritableByOthers = 022;
constexpr mode_t kOfOthers = 077;

bool isOwn(const struct stat& status) {
    return status.st_uid == ::geteuid() && (status.st_mode & kWritableByOthers) == 0;
}

bool isSymbolicLink(const posix::FolderEntry& entry) {
    struct stat status = {};
    return entry && ::fstatat(entry.folder(), entry.name(), &status, AT_SYMLINK_NOFOLLOW) == 0 &&
           S_ISLNK(status.st_mode);
}

// Takes from others what they may do with an open file. What there was, in one line.
std::string makePrivate(int file, mode_t mode, const std::string& path) {
    const bool isDone = ::fchmod(file, kFileMode) == 0;
    const bool isForAll = (mode & kOfOthers & S_IRWXO) != 0;
    return "The credentials in " + path + " could be read by " +
           (isForAll ? "everybody" : "the file's group") +
           (isDone ? "; they are the user's alone now" : ", and still can be");
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

bool credentialFileIsAbsent(const posix::RootFolder& root, const std::string& folderPath) {
    return !root.exists(platform::joinPath(folderPath, kFileName)) && errno == ENOENT;
}

Outcome CredentialFolder::_failure(platform::CredentialStatus status, const char* name, int error) const {
    const std::string path = *name == '\0' ? _path : platform::joinPath(_path, name);
    return {status, error == 0 ? path : posix::systemError(path, error).message};
}

Outcome CredentialFolder::open(const posix::RootFolder& root, const std::string& path) {
    _path = root.shown(path);
    _folder = root.open(path, O_RDONLY | O_DIRECTORY | O_NOFOLLOW);
    if (!_folder && errno == ENOENT) {
        return {platform::kCredentialItemNotFound};
    }
    if (!_folder) {
        const int error = errno;
        return isSymbolicLink(root.entry(path)) ? _failure(platform::kCredentialStoreUnsafe, "")
                                                : _failure(platform::kCredentialReadFailed, "", error);
    }
    struct stat status = {};
    if (::fstat(_folder.get(), &status) != 0) {
        return _failure(platform::kCredentialReadFailed, "", errno);
    }
    return isOwn(status) ? Outcome() : _failure(platform::kCredentialStoreUnsafe, "");
}

Outcome CredentialFolder::lock(const posix::RootFolder& root, const std::string& path) {
    _lock = posix::FileLock(root, path);
    if (!_lock) {
        return {_lock.error().number == ETIMEDOUT ? platform::kCredentialStoreInUse
                                                  : platform::kCredentialWriteFailed,
                _lock.error().message};
    }
    posix::removeLeftOver(_folder.get(), kFileName);
    return {};
}

Outcome CredentialFolder::load(PropertyList::Array& items, std::string* complaint) {
    items.clear();
    _changed = 0;
    // A pipe must not block.
    const posix::FileDescriptor file(
        ::openat(_folder.get(), kFileName, O_RDONLY | O_NOFOLLOW | O_CLOEXEC | O_NONBLOCK));
    if (!file && errno == ENOENT) {
        return {};
    }
    if (!file) {
        return errno == ELOOP ? _failure(platform::kCredentialStoreUnsafe, kFileName)
                              : _failure(platform::kCredentialReadFailed, kFileName, errno);
    }
    struct stat status = {};
    if (::fstat(file.get(), &status) != 0) {
        return _failure(platform::kCredentialReadFailed, kFileName, errno);
    }
    if (!S_ISREG(status.st_mode) || !isOwn(status)) {
        return _failure(platform::kCredentialStoreUnsafe, kFileName);
    }
    if (complaint && (status.st_mode & kOfOthers) != 0) {
        *complaint = makePrivate(file.get(), status.st_mode, platform::joinPath(_path, kFileName));
    }
    _changed = status.st_mtim.tv_sec;
    std::string bytes;
    if (const int error = posix::readAll(file.get(), bytes); error != 0) {
        return _failure(platform::kCredentialReadFailed, kFileName, error);
    }
    return takeItems(bytes, items) ? Outcome() : _failure(platform::kCredentialStoreDamaged, kFileName);
}

Outcome CredentialFolder::save(PropertyList::Array items) const {
    if (items.empty()) {
        const bool removed = ::unlinkat(_folder.get(), kFileName, 0) == 0;
        if (removed) {
            // A deleted item must not come back after a crash.
            ::fsync(_folder.get());
            return {};
        }
        if (errno != EBUSY) {
            return _failure(platform::kCredentialWriteFailed, kFileName, errno);
        }
        // A mount point cannot be removed: it keeps an empty list.
    }
    PropertyList::Dictionary store;
    store[kVersionKey] = kVersion;
    store[kItemsKey] = std::move(items);
    const std::optional<std::string> bytes = writeXMLPropertyList(PropertyList(std::move(store)));
    const int error = bytes ? posix::replaceFile(_folder.get(), kFileName, *bytes, kFileMode) : EINVAL;
    return error == 0 ? Outcome() : _failure(platform::kCredentialWriteFailed, kFileName, error);
}

} // namespace welcomer::local
