#include "backends/local/preferences/LocalPreferenceStore.h"

#include "platform/Path.h"
#include "propertylist/Lookup.h"
#include "propertylist/UnwritableValue.h"

#include <algorithm>
#include <utility>

namespace welcomer::local {

namespace {

using State = DictionaryFileContent::State;

constexpr char kFolderName[] = "Preferences";

std::string fileName(const std::string& domain) {
    return domain + ".plist";
}

// Whether a domain can have a file.
bool isDomainName(const std::string& name) {
    return !name.empty() && name.find('/') == std::string::npos && name.find('\0') == std::string::npos;
}

} // namespace

LocalPreferenceStore::LocalPreferenceStore(posix::RootFolder root, platform::ProcessIdentity& identity,
                                           platform::SystemLog& log)
    : _root(std::move(root)),
      _identity(identity),
      _log(log) {}

std::optional<PropertyList> LocalPreferenceStore::copyValue(const std::string& key,
                                                            const std::string& domain) {
    const std::lock_guard lock(_mutex);
    Domain& used = _use(domain);
    if (const auto change = used.changes.find(key); change != used.changes.end()) {
        return change->second;
    }
    if (!used.isLoaded) {
        _load(domain, used);
    }
    return copyOf(valueIn(used.onDisk.values, key));
}

std::vector<std::optional<PropertyList>> LocalPreferenceStore::copyValues(std::span<const std::string> keys,
                                                                          const std::string& domain) {
    std::vector<std::optional<PropertyList>> values(keys.size());
    const std::lock_guard lock(_mutex);
    Domain& used = _use(domain);
    if (!used.isLoaded) {
        _load(domain, used);
    }
    // One walk past everything, which is little next to having read it, beats a search for each key.
    const auto take = [&](const std::string& key, const auto& value) {
        if (const auto found = std::ranges::find(keys, key); found != keys.end()) {
            values[static_cast<std::size_t>(found - keys.begin())] = value;
        }
    };
    for (const auto& [key, value] : used.onDisk.values) {
        take(key, value);
    }
    for (const auto& [key, value] : used.changes) {
        take(key, value);
    }
    return values;
}

void LocalPreferenceStore::setValue(const std::string& key, const PropertyList& value,
                                    const std::string& domain) {
    if (const auto unwritable = findUnwritableEntry(key, value)) {
        _log.write(platform::kErrorPriority,
                   "Preferences " + domain + " refuse a value that cannot be written: " + *unwritable);
        return;
    }
    const std::lock_guard lock(_mutex);
    _use(domain).changes.insert_or_assign(key, value);
}

void LocalPreferenceStore::removeValue(const std::string& key, const std::string& domain) {
    const std::lock_guard lock(_mutex);
    _use(domain).changes.insert_or_assign(key, std::nullopt);
}

bool LocalPreferenceStore::synchronise(const std::string& domain) {
    const std::lock_guard lock(_mutex);
    Domain& used = _use(domain);
    return used.changes.empty() ? _load(domain, used) : _storeChanges(domain, used);
}

std::vector<platform::DamagedPreferences> LocalPreferenceStore::damagedPreferences() {
    const std::lock_guard lock(_mutex);
    return _damaged;
}

LocalPreferenceStore::Domain& LocalPreferenceStore::_use(const std::string& name) {
    if (!_lastUsed || _lastUsed->first != name) {
        _lastUsed = &*_domains.try_emplace(name).first;
    }
    return _lastUsed->second;
}

const std::string& LocalPreferenceStore::_library() {
    if (!_userLibrary) {
        const std::vector<std::string> libraries = _identity.userLibraryDirectories();
        _userLibrary = libraries.empty() ? "" : libraries.front();
    }
    return *_userLibrary;
}

std::string LocalPreferenceStore::_folder() {
    const std::string& library = _library();
    return library.empty() ? "" : platform::joinPath(library, kFolderName);
}

LockedDictionaryFolder LocalPreferenceStore::_lockedFolder() {
    return {_root, _folder(), posix::userLockPath(_library(), kFolderName)};
}

const std::string& LocalPreferenceStore::_pathOf(const std::string& name, Domain& domain) {
    if (domain.path.empty()) {
        domain.path = platform::joinPath(_folder(), fileName(name));
    }
    return domain.path;
}

bool LocalPreferenceStore::_load(const std::string& name, Domain& domain) {
    domain.isLoaded = true;
    if (!isDomainName(name) || _folder().empty()) {
        return false;
    }
    rereadDictionaryFile(_root, _pathOf(name, domain), domain.onDisk);
    if (domain.onDisk.state == State::Damaged) {
        // What was read may be a file that is being rewritten in place; with the lock it is what it is.
        LockedDictionaryFolder folder = _lockedFolder();
        if (folder) {
            _readLocked(name, domain, folder);
        } else {
            _noteDamage(name, domain.onDisk.reason, {});
        }
    }
    return domain.onDisk.state != State::Unreadable;
}

bool LocalPreferenceStore::_storeChanges(const std::string& name, Domain& domain) {
    _userLibrary.reset(); // asking makes the library folder where it is missing
    if (!isDomainName(name) || _folder().empty()) {
        return false;
    }
    LockedDictionaryFolder folder = _lockedFolder();
    if (!folder) {
        _noteNotStored(name, folder.error().message);
        return false;
    }
    if (!_readLocked(name, domain, folder)) {
        _noteNotStored(name,
                       domain.onDisk.state == State::Unreadable
                           ? "cannot read " + _root.shown(_pathOf(name, domain)) + ": " + domain.onDisk.reason
                           : folder.error().message);
        return false;
    }
    PropertyList::Dictionary merged = domain.onDisk.values;
    for (const auto& [key, value] : domain.changes) {
        if (value) {
            merged.insert_or_assign(key, *value);
        } else {
            merged.erase(key);
        }
    }
    if (merged != domain.onDisk.values) {
        std::optional<std::string> bytes = folder.write(fileName(name), merged);
        if (!bytes) {
            if (const auto unwritable = findUnwritableValue(merged)) {
                _noteDamage(name, "nothing can be stored while " + *unwritable, {});
            } else {
                _noteNotStored(name, folder.error().message);
            }
            return false;
        }
        domain.onDisk = {State::Whole, std::move(merged), std::move(*bytes), {}};
    }
    domain.changes.clear();
    domain.isLoaded = true;
    return true;
}

bool LocalPreferenceStore::_readLocked(const std::string& name, Domain& domain,
                                       LockedDictionaryFolder& folder) {
    rereadDictionaryFile(_root, _pathOf(name, domain), domain.onDisk);
    if (domain.onDisk.state != State::Damaged) {
        return domain.onDisk.state == State::Whole;
    }
    const std::string other = folder.setAside(fileName(name), domain.onDisk.bytes);
    _noteDamage(name, domain.onDisk.reason, other);
    if (other.empty()) {
        return false;
    }
    domain.onDisk = {};
    return true;
}

void LocalPreferenceStore::_noteNotStored(const std::string& name, const std::string& reason) {
    _log.write(platform::kErrorPriority, "Preferences " + name + " could not be stored: " + reason);
}

void LocalPreferenceStore::_noteDamage(const std::string& name, const std::string& reason,
                                       const std::string& setAsideName) {
    const platform::DamagedPreferences damage{
        name, reason, setAsideName.empty() ? std::string() : platform::joinPath(_folder(), setAsideName)};
    // What cannot be set aside is met again by each reading.
    if (std::ranges::count(_damaged, damage) == 0) {
        _damaged.push_back(damage);
        _log.write(platform::kErrorPriority,
                   "Preferences " + name + " are damaged (" + reason + ") and " +
                       (setAsideName.empty() ? "still in their place" : "now at " + damage.setAsidePath));
    }
}

// The changes themselves have been looked at: what stands in the way came with the file.

} // namespace welcomer::local
